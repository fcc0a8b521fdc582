#include "cli/ServeCommand.h"

#include <arpa/inet.h>

#include <iostream>
#include <stdexcept>

#include "cli/HostOptions.h"
#include "cli/StopSignal.h"
#include "cli/UsageError.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"
#include "gateway/TagTable.h"
#include "lang/VbError.h"

namespace maroset::cli {

const char* const ServeCommand::Usage =
    "usage: maroset serve PROJECT [--http ADDR:PORT] [--allow-writes] [--token TOKEN]\n"
    "                     [--drive-root DIR] [--com [NODE:]N=DEVICE]... [--modbus-port P]\n"
    "                     [--trap] [--trace]\n"
    "\n"
    "Runs the project database PROJECT as a service: loads its nodes, registers the tags of\n"
    "its Tags table (see 'maroset project tag'), starts scanning and serves the live page and\n"
    "the HTTP API until SIGINT or SIGTERM.\n"
    "\n"
    "Options:\n"
    "  --http ADDR:PORT   where to listen (default 127.0.0.1:8080; port 0 picks a free one)\n"
    "  --allow-writes     let clients write tags (POST /api/tags/NODE/HANDLE)\n"
    "  --token TOKEN      every write needs 'Authorization: Bearer TOKEN'; an address other\n"
    "                     than loopback refuses writes without one\n"
    "  --drive-root, --com, --modbus-port, --trap, --trace   as for 'maroset run'\n";

void ServeCommand::ParseListen(const std::string& text, gateway::WebService::Settings& settings) {
    const auto colon = text.rfind(':');
    const auto port = colon == std::string::npos
                          ? std::nullopt
                          : CommandLine::ParseInteger(text.substr(colon + 1));
    in_addr address{};
    const std::string host = colon == std::string::npos ? "" : text.substr(0, colon);
    if (!port || *port < 0 || *port > 65535 || inet_pton(AF_INET, host.c_str(), &address) != 1)
        throw UsageError("option '--http' needs ADDR:PORT with an IPv4 address, not '" + text +
                         "'");
    settings.host = host;
    settings.port = static_cast<uint16_t>(*port);
}

int ServeCommand::Main(const std::vector<std::string>& args) {
    auto declared = HostOptions::Declared();
    declared.push_back({"http", true});
    declared.push_back({"allow-writes"});
    declared.push_back({"token", true});
    CommandLine cl(declared);
    HostOptions options;
    gateway::WebService::Settings web;
    try {
        cl.parse(args);
        if (cl.help()) {
            std::cout << Usage;
            return 0;
        }
        cl.requireOperands(1, 1);
        options.project = cl.operands()[0];
        options.read(cl);
        if (auto listen = cl.value("http")) ParseListen(*listen, web);
        web.allowWrites = cl.has("allow-writes");
        web.token = cl.value("token").value_or("");
        if (cl.has("token") && web.token.empty()) throw UsageError("option '--token' is empty");
    } catch (const UsageError& e) {
        std::cerr << "maroset serve: " << e.what() << "\n" << Usage;
        return 2;
    }
    std::optional<TracePrinter> trace;
    options.apply(trace);
    if (!options.projectExists()) {
        std::cerr << "maroset serve: project database '" << options.project << "' not found\n";
        return 1;
    }

    Runtime& rt = Runtime::current();
    ClsNodeDBInterface host;
    nodeDB& db = *host.nodeDB();
    // The nodes go whatever happens from here on.
    struct Teardown {
        nodeDB& db;
        ~Teardown() {
            try {
                db.StopScanning();
                db.RemoveAllNodes();
            } catch (const VbError& e) {
                std::cerr << "maroset serve: stopping: error " << e.number() << ": "
                          << e.description() << "\n";
            }
        }
    } teardown{db};

    auto report = [](const std::string& line) { std::cerr << "maroset serve: " << line << "\n"; };
    std::vector<gateway::TagTable::Row> rows;
    try {
        // A node that does not start stays in the project, down, and is shown so.
        db.AddAllNodes(options.project);
    } catch (const VbError& e) {
        report("load: error " + std::to_string(e.number()) + ": " + e.description());
    }
    try {
        rows = gateway::TagTable::Rows(options.projectFile());
    } catch (const VbError& e) {
        report("Tags table: error " + std::to_string(e.number()) + ": " + e.description());
    }
    const auto tags = gateway::TagTable::Register(db, rows, report);
    try {
        db.StartScanning();
    } catch (const VbError& e) {
        report("start: error " + std::to_string(e.number()) + ": " + e.description());
    }

    std::optional<gateway::WebService> service;
    try {
        service.emplace(db, tags, web);
    } catch (const std::runtime_error& e) {
        report(e.what());
        return 1;
    }
    if (web.allowWrites && !service->writesAllowed())
        report("writes refused: " + web.host + " is not loopback and no --token was given");
    std::cout << "maroset serve: listening on " << service->url() << std::endl;

    platform::EventLoop& loop = rt.loop();
    StopSignal stop(loop, [&] { loop.stop(); });
    while (!stop.received()) loop.run();
    return 0;
}

}  // namespace maroset::cli
