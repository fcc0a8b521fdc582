#include "cli/Demo.h"

#include <stdlib.h>

#include <iostream>
#include <system_error>
#include <utility>

#include "cli/CommandLine.h"
#include "cli/Df1Station.h"
#include "cli/DiskTagStation.h"
#include "cli/EventPrinter.h"
#include "cli/IntechStation.h"
#include "cli/MemoryTagStation.h"
#include "cli/OpcStation.h"
#include "cli/ProjectDatabase.h"
#include "cli/ServeCommand.h"
#include "cli/SoftPlcStation.h"
#include "cli/StopSignal.h"
#include "cli/UsageError.h"
#include "cli/WagoStation.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"
#include "lang/VbError.h"
#include "platform/Timer.h"

namespace maroset::cli {

const char* const Demo::Usage =
    "usage: maroset demo [--seconds N] [--json] [--http [ADDR:PORT]]\n"
    "\n"
    "Builds a demo project in a temporary drive root, starts it, and shows its value\n"
    "changes live for N seconds (default 10); then stops and removes the drive root.\n"
    "Ctrl-C stops it early.\n"
    "\n"
    "Options:\n"
    "  --seconds N   how long to run (1 to 86400)\n"
    "  --json        events as JSON lines on standard output, narration on standard error\n"
    "  --http [ADDR:PORT]  serve the live page and API while it runs (default\n"
    "                127.0.0.1:8080; port 0 picks a free one)\n";

namespace {

class TempDriveRoot {
  public:
    TempDriveRoot() {
        std::string pattern =
            (std::filesystem::temp_directory_path() / "maroset-demo-XXXXXX").string();
        if (!mkdtemp(pattern.data()))
            throw std::system_error(errno, std::generic_category(), "mkdtemp");
        path_ = pattern;
    }
    ~TempDriveRoot() {
        std::error_code ec;
        std::filesystem::remove_all(path_, ec);
    }
    const std::filesystem::path& path() const { return path_; }

  private:
    std::filesystem::path path_;
};

}  // namespace

std::vector<std::unique_ptr<DemoStation>> Demo::Stations() {
    std::vector<std::unique_ptr<DemoStation>> stations;
    stations.push_back(std::make_unique<MemoryTagStation>());
    stations.push_back(std::make_unique<DiskTagStation>());
    stations.push_back(std::make_unique<Df1Station>());
    stations.push_back(std::make_unique<IntechStation>());
    stations.push_back(std::make_unique<SoftPlcStation>());
    stations.push_back(std::make_unique<WagoStation>());
    stations.push_back(std::make_unique<OpcStation>());
    return stations;
}

int Demo::Main(const std::vector<std::string>& given) {
    // --http takes its address only when one follows it.
    std::vector<std::string> args;
    for (size_t i = 0; i < given.size(); ++i) {
        if (given[i] != "--http") {
            args.push_back(given[i]);
        } else if (i + 1 < given.size() && given[i + 1].find(':') != std::string::npos) {
            args.push_back("--http=" + given[++i]);
        } else {
            args.push_back("--http=127.0.0.1:8080");
        }
    }
    CommandLine cl({{"seconds", true}, {"json"}, {"http", true}});
    int32_t seconds = 10;
    std::optional<gateway::WebService::Settings> web;
    try {
        cl.parse(args);
        if (cl.help()) {
            std::cout << Usage;
            return 0;
        }
        cl.requireOperands(0, 0);
        if (auto n = cl.integer("seconds", 1, 86400)) seconds = *n;
        if (auto listen = cl.value("http")) {
            web.emplace().allowWrites = true;
            ServeCommand::ParseListen(*listen, *web);
        }
    } catch (const UsageError& e) {
        std::cerr << "maroset demo: " << e.what() << "\n" << Usage;
        return 2;
    }
    const bool json = cl.has("json");
    Demo demo(seconds, json, std::cout, json ? std::cerr : std::cout);
    if (web) demo.serve(*web);
    return demo.run();
}

Demo::Demo(int32_t seconds, bool json, std::ostream& out, std::ostream& narration)
    : seconds_(seconds), json_(json), out_(out), narration_(narration), stations_(Stations()) {}

int Demo::run() {
    try {
        TempDriveRoot root;
        runProject(root.path());
        narration_ << "Removed the temporary drive root." << std::endl;
        return 0;
    } catch (const VbError& e) {
        narration_.flush();
        std::cerr << "maroset demo: " << e.description() << " (error " << e.number() << ")"
                  << std::endl;
    } catch (const std::exception& e) {
        narration_.flush();
        std::cerr << "maroset demo: " << e.what() << std::endl;
    }
    return 1;
}

void Demo::runProject(const std::filesystem::path& root) {
    Runtime& rt = Runtime::current();
    rt.files().setDriveRoot(root);
    const std::filesystem::path project = root / "demo-project.db";
    ProjectDatabase::Create(project);
    std::string titles;
    for (size_t i = 0; i < stations_.size(); ++i) {
        stations_[i]->addNodes(project);
        titles += (i == 0                      ? ""
                   : i + 1 == stations_.size() ? " and "
                                               : ", ") +
                  stations_[i]->title();
    }
    narration_ << "Maroset demo: " << titles << ", live for " << seconds_ << " s (Ctrl-C stops)."
               << "\nDrive root " << root.string() << " (temporary)." << std::endl;

    EventPrinter printer(out_, json_);
    ClsNodeDBInterface host;
    auto values =
        host.ValueChange.subscribe([&](VbArray<int32_t>& ids, int16_t count, VbArray<Variant>& v) {
            printer.valueChange(ids, count, v);
        });
    auto errors = host.DriverError.subscribe(
        [&](const std::string& driver, const std::string& from, const std::string& message) {
            printer.driverError(driver, from, message);
        });
    nodeDB& db = *host.nodeDB();
    platform::EventLoop& loop = rt.loop();

    // Nodes, simulators and scanning are undone whatever happens on the way.
    // Drivers may still report while they shut down (one that yields to the loop lets the
    // others' timers run), so the summary is counted after it.
    struct Teardown {
        nodeDB& db;
        std::vector<std::unique_ptr<DemoStation>>& stations;
        bool done = false;
        void run() {
            if (std::exchange(done, true)) return;
            try {
                db.StopScanning();
                db.RemoveAllNodes();
            } catch (const VbError&) {
            }
            for (auto& s : stations) s->stopSimulator();
        }
        ~Teardown() { run(); }
    } teardown{db, stations_};

    for (auto& s : stations_) s->startSimulator();
    db.AddAllNodes(project.string());
    DemoStation::DemoTags tags;
    for (auto& s : stations_) s->addTags(db, printer, tags);
    db.StartScanning();
    std::optional<gateway::WebService> service;
    if (web_) {
        service.emplace(db, tags, *web_);
        narration_ << "Live page on " << service->url() << std::endl;
    }
    for (auto& s : stations_) s->tick(db, 0);

    int32_t second = 0;
    std::optional<VbError> failed;
    platform::Timer ticker(loop);
    auto tick = ticker.Tick.subscribe([&] {
        ++second;
        try {
            for (auto& s : stations_) s->tick(db, second);
        } catch (const VbError& e) {
            failed = e;
            loop.stop();
        }
    });
    ticker.Interval(1000);
    ticker.Enabled(true);
    StopSignal interrupt(loop, [&] { loop.stop(); });
    const auto started = loop.now();
    loop.runFor(std::chrono::seconds(seconds_));
    ticker.Enabled(false);
    if (failed) throw *failed;

    const auto elapsed =
        std::chrono::duration_cast<std::chrono::seconds>(loop.now() - started).count();
    teardown.run();
    narration_ << (interrupt.received() ? "Interrupted" : "Stopped") << " after " << elapsed
               << " s: " << printer.valueChanges() << " value changes, " << printer.driverErrors()
               << " driver errors." << std::endl;
}

}  // namespace maroset::cli
