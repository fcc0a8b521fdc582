#include "cli/HostSession.h"

#include <unistd.h>

#include <cerrno>
#include <iostream>

#include "cli/BadCommand.h"
#include "cli/CommandLine.h"
#include "cli/CommandTokenizer.h"
#include "cli/UsageError.h"
#include "core/ClsNodeDBInterface.h"
#include "core/LinkStatusBoard.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"
#include "lang/Strings.h"
#include "lang/VbError.h"

namespace maroset::cli {

const char* const HostSession::Usage =
    "usage: maroset run PROJECT [--drive-root DIR] [--com [NODE:]N=DEVICE]...\n"
    "                   [--modbus-port P] [--trap] [--trace] [--json]\n"
    "\n"
    "Loads the nodes of the project database PROJECT, then reads commands from standard\n"
    "input, one per line, and prints every value change and driver error as one line.\n"
    "Every command is answered by one reply line, after the events it caused.\n"
    "\n"
    "Options:\n"
    "  --drive-root DIR   directory that stands for drive C: (disk tags, error log)\n"
    "  --com N=DEVICE     serial port N is DEVICE (default /dev/ttyS<N-1>); repeatable\n"
    "  --com NODE:N=DEVICE  the same for node NODE only (two serial nodes on port 1)\n"
    "  --modbus-port P    connect to couplers on TCP port P instead of 502\n"
    "  --trap             switch error trapping on: errors are logged to\n"
    "                     <drive root>/MarosetErrors.txt instead of reported\n"
    "  --trace            print what happens on the drivers' links (frames, NAKs,\n"
    "                     time-outs, bad checks, failed requests) to standard error\n"
    "  --json             one JSON object per line\n"
    "\n"
    "Commands (VALUE: integer, decimal number, true/false, or text; quote text with\n"
    "blanks in double quotes):\n"
    "  add NODE HANDLE ADDRESS       register a tag (ADDRESS is the rest of the line)\n"
    "  remove NODE HANDLE            unregister a tag\n"
    "  read NODE HANDLE              read a tag; the value arrives as a value change\n"
    "  write NODE HANDLE VALUE       write a tag\n"
    "  writearray NODE HANDLE VALUE...  write an array (zero-based) to a tag\n"
    "  start | stop                  start or stop scanning every node\n"
    "  addnode NAME DRIVER [TOPIC [SCANRATE [PREFIX]]]  add a node by hand\n"
    "  removenode NAME | removeall   remove one node or all of them\n"
    "  nodes                         list the nodes\n"
    "  status [NODE]                 the link status of every node, or of one\n"
    "  sleep MS                      let the loop run MS ms before the next command\n"
    "  quit                          stop scanning, remove all nodes and exit (also at end\n"
    "                                of input)\n"
    "Blank lines and lines starting with # are skipped.\n";

const HostSession::Command HostSession::Commands[] = {
    {"add", &HostSession::add},
    {"remove", &HostSession::remove},
    {"read", &HostSession::read},
    {"write", &HostSession::write},
    {"writearray", &HostSession::writearray},
    {"start", &HostSession::start},
    {"stop", &HostSession::stop},
    {"addnode", &HostSession::addnode},
    {"removenode", &HostSession::removenode},
    {"removeall", &HostSession::removeall},
    {"nodes", &HostSession::nodes},
    {"status", &HostSession::status},
    {"sleep", &HostSession::sleep},
    {"quit", &HostSession::quit},
};

namespace {

// Arguments of a command, with the reason a missing or malformed one is refused.
std::string word(CommandTokenizer& args, const char* what) {
    auto w = args.next();
    if (!w) throw BadCommand(std::string("missing ") + what);
    return w->text;
}

int32_t integer(CommandTokenizer& args, const char* what) {
    const std::string text = word(args, what);
    const auto value = CommandLine::ParseInteger(text);
    if (!value) throw BadCommand(std::string(what) + " must be a whole number, not " + text);
    return *value;
}

void noMore(CommandTokenizer& args) {
    if (auto extra = args.next()) throw BadCommand("unexpected " + extra->text);
}

HostOptions parseOptions(const std::vector<std::string>& args, bool& help) {
    auto declared = HostOptions::Declared();
    declared.push_back({"json"});
    CommandLine cl(declared);
    cl.parse(args);
    help = cl.help();
    HostOptions options;
    if (help) return options;
    cl.requireOperands(1, 1);
    options.project = cl.operands()[0];
    options.read(cl);
    options.json = cl.has("json");
    return options;
}

}  // namespace

int HostSession::Main(const std::vector<std::string>& args) {
    HostOptions options;
    try {
        bool help = false;
        options = parseOptions(args, help);
        if (help) {
            std::cout << Usage;
            return 0;
        }
    } catch (const UsageError& e) {
        std::cerr << "maroset run: " << e.what() << "\n" << Usage;
        return 2;
    }
    HostSession session(std::move(options), std::cout, STDIN_FILENO);
    return session.run();
}

HostSession::HostSession(HostOptions options, std::ostream& out, int inputFd)
    : options_(std::move(options)), printer_(out, options_.json), inputFd_(inputFd) {
    options_.apply(trace_);
}

HostSession::~HostSession() {
    if (inputWatch_) loop().unwatch(*inputWatch_);
    trace_.reset();
    valueChange_.reset();
    driverError_.reset();
    host_.reset();
}

platform::EventLoop& HostSession::loop() {
    return Runtime::current().loop();
}

maroset::nodeDB& HostSession::db() {
    return *host_->nodeDB();
}

std::shared_ptr<node> HostSession::nodeNamed(const std::string& name) {
    // A node the project does not have is used as an unset object variable would be.
    auto n = db().getNode(name);
    if (!n) throw VbError(err::ObjectNotSet);
    return n;
}

template <class Operation>
void HostSession::guarded(Reply& reply, Operation&& operation) {
    try {
        operation();
    } catch (const BadCommand& e) {
        reply.fail(err::InvalidProcedureCall, ErrorDescription(err::InvalidProcedureCall),
                   e.what());
    } catch (const VbError& e) {
        reply.fail(e.number(), e.description());
    } catch (const std::exception& e) {
        // Not a run-time error of the system: shown as the language's internal error.
        reply.fail(51, "Internal error", e.what());
    }
}

int HostSession::run() {
    if (!options_.projectExists()) {
        std::cerr << "maroset run: project database '" << options_.project << "' not found\n";
        return 1;
    }
    host_ = std::make_unique<ClsNodeDBInterface>();
    valueChange_ = host_->ValueChange.subscribe(
        [this](VbArray<int32_t>& ids, int16_t count, VbArray<Variant>& values) {
            printer_.valueChange(ids, count, values);
        });
    driverError_ = host_->DriverError.subscribe(
        [this](const std::string& driver, const std::string& from, const std::string& message) {
            printer_.driverError(driver, from, message);
        });

    Reply load{"load"};
    guarded(load, [&] { db().AddAllNodes(options_.project); });
    printer_.reply(load);

    watchInput();
    while (!done_) loop().run();
    return 0;
}

void HostSession::watchInput() {
    inputWatch_ =
        loop().watch(inputFd_, platform::EventLoop::Readable, [this](short) { onInput(); });
}

void HostSession::onInput() {
    // No more input is read until the commands in hand are done.
    if (inputWatch_) loop().unwatch(*inputWatch_);
    inputWatch_.reset();

    char buffer[4096];
    ssize_t n;
    do {
        n = ::read(inputFd_, buffer, sizeof buffer);
    } while (n < 0 && errno == EINTR);
    if (n > 0) {
        partial_.append(buffer, static_cast<size_t>(n));
        size_t start = 0;
        for (size_t nl; (nl = partial_.find('\n', start)) != std::string::npos; start = nl + 1)
            queue_.push_back(partial_.substr(start, nl - start));
        partial_.erase(0, start);
    } else if (n == 0 || (errno != EAGAIN && errno != EWOULDBLOCK)) {
        endOfInput_ = true;
        if (!partial_.empty()) queue_.push_back(std::exchange(partial_, {}));
    }
    drain();
}

void HostSession::drain() {
    while (!done_ && !queue_.empty()) {
        std::string line = std::move(queue_.front());
        queue_.pop_front();
        if (!execute(line)) return;  // a sleep: the timer goes on from here
    }
    if (done_) return;
    if (endOfInput_) {
        Reply reply{"quit"};
        quitNow(reply);
        printer_.reply(reply);
        return;
    }
    watchInput();
}

bool HostSession::execute(const std::string& text) {
    std::string_view line = text;
    if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    const size_t first = line.find_first_not_of(" \t");
    if (first == std::string_view::npos || line[first] == '#') return true;

    // The command word is the first run of non-blanks, whatever it holds.
    line.remove_prefix(first);
    const size_t end = std::min(line.find_first_of(" \t"), line.size());
    const std::string name = LCase(line.substr(0, end));
    CommandTokenizer args(line.substr(end));

    const Command* command = nullptr;
    for (const auto& c : Commands) {
        if (name == c.name) command = &c;
    }
    Reply reply{command ? name : std::string(line.substr(0, end))};
    sleepFor_.reset();
    guarded(reply, [&] {
        if (!command) throw BadCommand("unknown command");
        (this->*command->handler)(args, reply);
    });
    if (sleepFor_) {
        loop().schedule(std::chrono::milliseconds(*sleepFor_), [this, reply] {
            printer_.reply(reply);
            drain();
        });
        sleepFor_.reset();
        return false;
    }
    printer_.reply(reply);
    return true;
}

void HostSession::finish() {
    done_ = true;
    loop().stop();
    // Should a driver's own nested run have taken the stop, the next turn stops us.
    loop().post([this] { loop().stop(); });
}

void HostSession::add(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NODE");
    const int32_t handle = integer(args, "HANDLE");
    const std::string address = args.rest();
    if (address.empty()) throw BadCommand("missing ADDRESS");
    reply.node = name;
    const auto n = nodeNamed(name);
    n->AddTag(handle, address);
}

void HostSession::remove(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NODE");
    const int32_t handle = integer(args, "HANDLE");
    noMore(args);
    reply.node = name;
    const auto n = nodeNamed(name);
    n->RemoveTag(handle);
}

void HostSession::read(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NODE");
    const int32_t handle = integer(args, "HANDLE");
    noMore(args);
    reply.node = name;
    const auto n = nodeNamed(name);
    n->ReadTag(handle);
}

void HostSession::write(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NODE");
    // The handle travels as the text given; the node converts it.
    const std::string handle = word(args, "HANDLE");
    auto value = args.next();
    if (!value) throw BadCommand("missing VALUE");
    noMore(args);
    const Variant v = CommandTokenizer::ParseValue(*value);
    reply.node = name;
    const auto n = nodeNamed(name);
    n->WriteTag(handle, v);
}

void HostSession::writearray(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NODE");
    const std::string handle = word(args, "HANDLE");
    std::vector<Variant> items;
    while (auto value = args.next()) items.push_back(CommandTokenizer::ParseValue(*value));
    if (items.empty()) throw BadCommand("missing VALUE");
    VbArray<Variant> values(0, std::move(items));
    reply.node = name;
    const auto n = nodeNamed(name);
    n->WriteArray(handle, values);
}

void HostSession::start(CommandTokenizer& args, Reply&) {
    noMore(args);
    db().StartScanning();
}

void HostSession::stop(CommandTokenizer& args, Reply&) {
    noMore(args);
    db().StopScanning();
}

void HostSession::addnode(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NAME");
    const std::string driver = word(args, "DRIVER");
    std::string topic;
    int32_t scanRate = 0;
    int32_t prefix = 0;
    if (auto t = args.next()) {
        topic = t->text;
        if (!args.atEnd()) scanRate = integer(args, "SCANRATE");
        if (!args.atEnd()) prefix = integer(args, "PREFIX");
    }
    noMore(args);
    reply.node = name;
    db().AddNode(name, driver, topic, scanRate, prefix);
}

void HostSession::removenode(CommandTokenizer& args, Reply& reply) {
    const std::string name = word(args, "NAME");
    noMore(args);
    reply.node = name;
    db().RemoveNode(name);
}

void HostSession::removeall(CommandTokenizer& args, Reply&) {
    noMore(args);
    db().RemoveAllNodes();
}

void HostSession::nodes(CommandTokenizer& args, Reply& reply) {
    noMore(args);
    std::vector<Reply::NodeEntry> list;
    for (const auto& n : db().nodes()) list.push_back({n->Name, n->DriverName});
    reply.nodes = std::move(list);
}

void HostSession::status(CommandTokenizer& args, Reply& reply) {
    const auto name = args.next();
    noMore(args);
    const LinkStatusBoard& board = Runtime::current().linkStatus();
    if (!name) {
        reply.status = board.All();
        return;
    }
    reply.node = name->text;
    const auto n = nodeNamed(name->text);
    std::vector<LinkStatus> one;
    if (const LinkStatus* s = board.Find(n->Name)) one.push_back(*s);
    reply.status = std::move(one);
}

void HostSession::sleep(CommandTokenizer& args, Reply&) {
    const int32_t ms = integer(args, "MS");
    if (ms < 0) throw BadCommand("MS must not be negative");
    noMore(args);
    sleepFor_ = ms;
}

void HostSession::quit(CommandTokenizer& args, Reply& reply) {
    noMore(args);
    quitNow(reply);
}

void HostSession::quitNow(Reply& reply) {
    // Both steps run even when the first fails; the first error is the one reported.
    guarded(reply, [&] { db().StopScanning(); });
    guarded(reply, [&] { db().RemoveAllNodes(); });
    finish();
}

}  // namespace maroset::cli
