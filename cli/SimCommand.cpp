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
#include "sim/wago/WagoCouplerSimulator.h"

namespace maroset::cli {

const char* const SimCommand::Usage =
    "usage: maroset sim KIND [options]\n"
    "\n"
    "Runs one device simulator on its own until Ctrl-C, prints where it listens, and reads\n"
    "fault and data commands from standard input (type help). `maroset sim KIND --help`\n"
    "tells the options of one kind.\n";

const std::vector<SimCommand::Kind>& SimCommand::Kinds() {
    static const std::vector<Kind> kinds = {
        {"wago",
         "WAGO coupler (Modbus/TCP)",
         "usage: maroset sim wago [--port P]\n"
         "\n"
         "A WAGO fieldbus coupler on 127.0.0.1: input words 0-255 (function 04) and bits 0-511\n"
         "(02) that move once a second, output words 0-255 and bits 0-4607 that writes set\n"
         "(06/16, 05/15) and that read back at 512 + n (03, 01; bits from 4095 on at 4096 + n),\n"
         "and the exception status (07).\n"
         "\n"
         "Options:\n"
         "  --port P   the TCP port to listen on (0 or absent: a free one)\n",
         {{"port", true}},
         [](const CommandLine& options) -> std::unique_ptr<sim::Simulator> {
             sim::WagoCouplerSimulator::Options o;
             o.port = static_cast<uint16_t>(options.integer("port", 0, 65535).value_or(0));
             return std::make_unique<sim::WagoCouplerSimulator>(o);
         },
         "Reach it from a project node of type WAGOIO with IPAddress 127.0.0.1: couplers use port\n"
         "502, so run the host as: maroset run PROJECT --modbus-port PORT (PORT: the port of {})"},
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
