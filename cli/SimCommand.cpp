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
#include "sim/df1/Df1Simulator.h"
#include "sim/intech/IntechSimulator.h"
#include "sim/softplc/SoftPlcSimulator.h"
#include "sim/wago/WagoCouplerSimulator.h"

namespace maroset::cli {

const char* const SimCommand::Usage =
    "usage: maroset sim KIND [options]\n"
    "\n"
    "Runs one device simulator on its own until Ctrl-C, prints where it listens, and reads\n"
    "fault and data commands from standard input (type help). `maroset sim KIND --help`\n"
    "tells the options of one kind.\n";

namespace {

// `maroset sim intech`: instruments at the given station addresses on a new pseudo-terminal.
std::unique_ptr<sim::Simulator> StartIntech(const CommandLine& options) {
    std::vector<std::string> addresses;
    const std::string list = options.value("stations").value_or("01");
    for (size_t at = 0; at <= list.size();) {
        const size_t comma = std::min(list.find(',', at), list.size());
        addresses.push_back(list.substr(at, comma - at));
        at = comma + 1;
    }
    try {
        auto simulator =
            sim::IntechSimulator::OnPseudoTerminal(Runtime::current().loop(), addresses);
        simulator->setDrift(1000);
        return simulator;
    } catch (const std::invalid_argument& e) {
        throw UsageError(e.what());
    }
}

}  // namespace

const std::vector<SimCommand::Kind>& SimCommand::Kinds() {
    static const std::vector<Kind> kinds = {
        {"df1",
         "DF1 PLC (Allen-Bradley, DF1 full duplex, 19200,n,8,1)",
         "usage: maroset sim df1 [--drift MS]\n"
         "\n"
         "Runs a simulated Allen-Bradley PLC on a new pseudo-terminal and prints its path.\n"
         "It answers DF1 full-duplex typed reads and writes (CMD 0x0F, FNC 0xA2/0xAA) on its\n"
         "data files B3 T4 C5 R6 N7 F8 N9 N10 (256 words each). N7:0 counts up, N7:1 ramps\n"
         "and N7:2 runs through values holding the byte 0x10, every MS ms. Commands on\n"
         "standard input set words and inject faults (NAK, silence, bad CRC, a pause in a\n"
         "reply, ENQ); type help.\n"
         "\n"
         "Options:\n"
         "  --drift MS   how often N7:0-2 change (default 1000; 0: never)\n",
         {{"drift", true}},
         [](const CommandLine& options) -> std::unique_ptr<sim::Simulator> {
             auto plc = sim::Df1Simulator::OnPseudoTerminal(Runtime::current().loop());
             plc->drift(options.integer("drift", 0, 3600000).value_or(1000));
             return plc;
         },
         "Point a host at it: maroset run PROJECT --com 1={}\n"
         "(a node with Driver NUVABDF1; tags N7:0, N7:1, ...)"},
        {"intech",
         "Intech instruments on a serial line (\"@\" ASCII protocol)",
         "usage: maroset sim intech [--stations LIST]\n"
         "\n"
         "Runs Intech instruments on a new pseudo-terminal and prints its path. They answer the\n"
         "analog (EX E5 0g:), extended analog (EX E1: .. EX E4:) and digital status (EX DI:)\n"
         "reads and the output write (EX DO ...); their values drift once a second.\n"
         "\n"
         "Options:\n"
         "  --stations LIST   station addresses, two characters each, separated by commas\n"
         "                    (default 01)\n"
         "\n"
         "Commands on standard input: set TAG VALUE, get TAG, fault KIND [N], fault none,\n"
         "drift on|off|MS, status, help.\n",
         {{"stations", true}},
         StartIntech,
         "Connect a host: maroset run PROJECT --com 1={}\n(NUVINTECH nodes use port 1; --com "
         "NODE:1=PATH maps it for one node only)"},
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
         "Point a node at it: Driver NUVTCPIP, IPAddress 127.0.0.1, Port {port}, e.g.\n"
         "  maroset project add plant.db PLC1 NUVTCPIP --ip-address 127.0.0.1 --port {port} "
         "--update-rate 1000"},
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
         "Reach it from a node of type WAGOIO with IPAddress 127.0.0.1; couplers are always\n"
         "reached on port 502, so run the host as: maroset run PROJECT --modbus-port {port}"},
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

// The connect hint with "{}" replaced by the endpoint and "{port}" by its TCP port.
std::string replaced(std::string text, const std::string& endpoint) {
    const std::string port = endpoint.substr(endpoint.rfind(':') + 1);
    for (const auto& [key, value] :
         {std::pair<std::string, std::string>{"{}", endpoint}, {"{port}", port}}) {
        for (size_t at; (at = text.find(key)) != std::string::npos;)
            text.replace(at, key.size(), value);
    }
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
            std::string answer = simulator_.command(line);
            if (!answer.empty() && answer.back() == '\n') answer.pop_back();
            std::cout << answer << std::endl;
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
