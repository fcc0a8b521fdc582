#pragma once

#include <cstdint>
#include <deque>
#include <filesystem>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "cli/EventPrinter.h"
#include "cli/HostOptions.h"
#include "cli/Reply.h"
#include "core/TracePrinter.h"
#include "lang/Subscription.h"
#include "platform/EventLoop.h"

namespace maroset {
class ClsNodeDBInterface;
class node;
class nodeDB;
}  // namespace maroset

namespace maroset::cli {

class CommandTokenizer;

// `maroset run`: a scriptable host. It loads the project with AddAllNodes, then reads
// commands from its input one line at a time while the runtime's loop keeps running, and
// prints every ValueChange and DriverError as one line, as it happens.
//
// Every command gets exactly one reply line, printed after the events the command caused.
// The load itself is answered as the implicit first command "load". A run-time error that
// escapes an operation becomes the error reply (with trapping on, the library handles its
// errors itself and the reply is ok). A command line that cannot be carried out as written
// is answered with Invalid procedure call or argument (5); a command on a node the project
// does not have with Object variable not set (91). Blank lines and lines starting with '#'
// are not commands and get no reply. End of input acts as "quit".
//
// Input is not read while a command runs: a driver that yields to the loop inside an
// operation never sees the next command start. "sleep MS" lets the loop run for MS ms before
// the next command is read.
class HostSession {
  public:
    static const char* const Usage;
    // `maroset run ARGS...`; returns the exit status.
    static int Main(const std::vector<std::string>& args);

    // Applies the options to the current runtime; commands come from inputFd.
    HostSession(HostOptions options, std::ostream& out, int inputFd);
    ~HostSession();
    HostSession(const HostSession&) = delete;
    HostSession& operator=(const HostSession&) = delete;

    // Loads the project and serves commands until quit; the exit status (1 when the project
    // does not exist, 0 otherwise).
    int run();

  private:
    using Handler = void (HostSession::*)(CommandTokenizer&, Reply&);
    struct Command {
        const char* name;
        Handler handler;
    };
    static const Command Commands[];

    platform::EventLoop& loop();
    maroset::nodeDB& db();
    std::shared_ptr<node> nodeNamed(const std::string& name);

    void watchInput();
    void onInput();
    // Runs queued commands until the queue is empty, a sleep starts or quit ends the session.
    void drain();
    // Runs one line; false when it started a sleep (its reply comes when the sleep ends).
    bool execute(const std::string& line);
    template <class Operation>
    void guarded(Reply& reply, Operation&& operation);
    void finish();

    void add(CommandTokenizer& args, Reply& reply);
    void remove(CommandTokenizer& args, Reply& reply);
    void read(CommandTokenizer& args, Reply& reply);
    void write(CommandTokenizer& args, Reply& reply);
    void writearray(CommandTokenizer& args, Reply& reply);
    void start(CommandTokenizer& args, Reply& reply);
    void stop(CommandTokenizer& args, Reply& reply);
    void addnode(CommandTokenizer& args, Reply& reply);
    void removenode(CommandTokenizer& args, Reply& reply);
    void removeall(CommandTokenizer& args, Reply& reply);
    void nodes(CommandTokenizer& args, Reply& reply);
    void status(CommandTokenizer& args, Reply& reply);
    void sleep(CommandTokenizer& args, Reply& reply);
    void quit(CommandTokenizer& args, Reply& reply);
    void quitNow(Reply& reply);

    HostOptions options_;
    EventPrinter printer_;
    int inputFd_;
    std::unique_ptr<ClsNodeDBInterface> host_;
    Subscription valueChange_;
    Subscription driverError_;
    // The link trace on standard error, with --trace.
    std::optional<TracePrinter> trace_;

    std::string partial_;            // input after the last complete line
    std::deque<std::string> queue_;  // complete lines not run yet
    std::optional<platform::EventLoop::WatchId> inputWatch_;
    std::optional<int32_t> sleepFor_;  // set by "sleep" for execute()
    bool endOfInput_ = false;
    bool done_ = false;
};

}  // namespace maroset::cli
