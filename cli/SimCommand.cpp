#include "cli/SimCommand.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <iostream>
#include <optional>

#include "cli/StopSignal.h"
#include "cli/UsageError.h"
#include "core/Runtime.h"
#include "lang/VbError.h"
#include "sim/softplc/SoftPlcSimulator.h"

namespace maroset::cli {

const char* const SimCommand::Usage =
    "usage: maroset sim KIND [options]\n"
    "\n"
    "Runs one device simulator on its own until Ctrl-C, prints where it listens, and reads\n"
    "fault and data commands from standard input (type help). `maroset sim KIND --help`\n"
    "tells the options of one kind.\n";

const std::vector<SimCommand::Kind>& SimCommand::Kinds() {
    static const std::vector<Kind> kinds = {
        {"softplc",
         "soft-PLC server (TCP)",
         "usage: maroset sim softplc [--port P] [--step MS]\n"
         "\n"
         "Runs a soft-PLC server on 127.0.0.1 and prints the port it listens on. It accepts\n"
         "NUVTCPIP nodes, acknowledges their frames, keeps tag values by handle, pushes the\n"
         "values of subscribed tags as they move and takes their writes.\n"
         "\n"
         "Options:\n"
         "  --port P    the TCP port (0 or absent: a free port)\n"
         "  --step MS   how often subscribed values move (default 1000; 0: only on writes)\n"
         "\n"
         "Commands on standard input (type help): values, set HANDLE VALUE, step,\n"
         "drop-acks N, nak N, split N, corrupt N, silent on|off, close, stop, start,\n"
         "restart, flood N, clients, received.\n",
         {{"port", true}, {"step", true}},
         [](const CommandLine& o) -> std::unique_ptr<sim::Simulator> {
             sim::SoftPlcSimulator::Options options;
             options.stepMs = o.integer("step", 0, 3600000).value_or(1000);
             options.splitGapMs = 50;  // so the two writes of a split frame arrive apart
             return sim::SoftPlcSimulator::OnLoopback(o.integer("port", 0, 65535).value_or(0),
                                                      options);
         },
         "Point a node at it: Driver NUVTCPIP, IPAddress 127.0.0.1, Port as in {}, e.g.\n"
         "  maroset project add plant.db PLC1 NUVTCPIP --ip-address 127.0.0.1 --port PORT "
         "--update-rate 1000"},
    };
    return kinds;
}

namespace {

std::string listOfKinds() {
    std::string out = "\nKinds:\n";
    for (const auto& k : SimCommand::Kinds()) {
        std::string name = k.name;
        name.resize(std::max<size_t>(name.size() + 2, 10), ' ');
        out += "  " + name + k.summary + "\n";
    }
    return out;
}

std::string replaced(std::string text, const std::string& endpoint) {
    if (const auto at = text.find("{}"); at != std::string::npos) text.replace(at, 2, endpoint);
    return text;
}

// Operator commands from standard input, one line at a time, while the loop serves.
class CommandReader {
  public:
    CommandReader(platform::EventLoop& loop, sim::Simulator& simulator)
        : loop_(loop), simulator_(simulator) {
        watch_ =
            loop_.watch(STDIN_FILENO, platform::EventLoop::Readable, [this](short) { read(); });
    }
    ~CommandReader() { stop(); }
    CommandReader(const CommandReader&) = delete;
    CommandReader& operator=(const CommandReader&) = delete;

  private:
    void stop() {
        if (watch_) loop_.unwatch(*watch_);
        watch_.reset();
    }
    void read() {
        char buffer[1024];
        const ssize_t n = ::read(STDIN_FILENO, buffer, sizeof buffer);
        if (n < 0 && (errno == EINTR || errno == EAGAIN)) return;
        if (n <= 0) {
            stop();  // no more commands; the simulator goes on serving
            return;
        }
        partial_.append(buffer, static_cast<size_t>(n));
        for (size_t nl; (nl = partial_.find('\n')) != std::string::npos;) {
            std::string line = partial_.substr(0, nl);
            partial_.erase(0, nl + 1);
            if (!line.empty() && line.back() == '\r') line.pop_back();
            if (line.find_first_not_of(" \t") == std::string::npos) continue;
            std::cout << simulator_.command(line) << std::endl;
        }
    }

    platform::EventLoop& loop_;
    sim::Simulator& simulator_;
    std::optional<platform::EventLoop::WatchId> watch_;
    std::string partial_;
};

}  // namespace

int SimCommand::Main(const std::vector<std::string>& args) {
    if (args.empty() || args[0] == "--help" || args[0] == "-h") {
        (args.empty() ? std::cerr : std::cout) << Usage << listOfKinds();
        return args.empty() ? 2 : 0;
    }
    const Kind* kind = nullptr;
    for (const auto& k : Kinds()) {
        if (args[0] == k.name) kind = &k;
    }
    if (!kind) {
        std::cerr << "maroset sim: unknown kind '" << args[0] << "'\n" << Usage << listOfKinds();
        return 2;
    }
    CommandLine cl(kind->options);
    try {
        cl.parse({args.begin() + 1, args.end()});
        if (cl.help()) {
            std::cout << kind->usage;
            return 0;
        }
        cl.requireOperands(0, 0);
    } catch (const UsageError& e) {
        std::cerr << "maroset sim " << kind->name << ": " << e.what() << "\n" << kind->usage;
        return 2;
    }
    return Serve(*kind, cl);
}

int SimCommand::Serve(const Kind& kind, const CommandLine& options) {
    platform::EventLoop& loop = Runtime::current().loop();
    std::unique_ptr<sim::Simulator> simulator;
    try {
        simulator = kind.start(options);
    } catch (const VbError& e) {
        std::cerr << "maroset sim " << kind.name << ": " << e.description() << std::endl;
        return 1;
    } catch (const UsageError& e) {
        std::cerr << "maroset sim " << kind.name << ": " << e.what() << "\n" << kind.usage;
        return 2;
    } catch (const std::exception& e) {
        std::cerr << "maroset sim " << kind.name << ": " << e.what() << std::endl;
        return 1;
    }
    const std::string endpoint = simulator->endpoint();
    std::cout << kind.summary << " on " << endpoint << "\n"
              << replaced(kind.connect, endpoint) << "\n"
              << "Type help for fault and data commands; Ctrl-C stops." << std::endl;
    CommandReader reader(loop, *simulator);
    StopSignal interrupt(loop, [&] { loop.stop(); });
    loop.run();
    std::cout << "Stopped." << std::endl;
    return 0;
}

}  // namespace maroset::cli
