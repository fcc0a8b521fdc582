#include "cli/ProjectCommands.h"

#include <algorithm>
#include <iostream>
#include <optional>

#include "cli/CommandLine.h"
#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "cli/UsageError.h"
#include "gateway/JsonWriter.h"
#include "gateway/TagTable.h"
#include "lang/VbError.h"

namespace maroset::cli {

using gateway::JsonWriter;

const char* const ProjectCommands::Usage =
    "usage: maroset project init PATH\n"
    "       maroset project add PATH NAME DRIVER [options]\n"
    "       maroset project list PATH [--json]\n"
    "       maroset project tag add|remove|list PATH ...\n"
    "\n"
    "Creates and edits a project database: an SQLite file with a Nodes table (Name, Driver,\n"
    "OPCServer, OPCTopic, UpdateRate, CommPort, BaudRate, TagPrefex, IPAddress, Port).\n"
    "DRIVER is one of MEMTAG, DISKTAG, OPC, WAGOIO, NUVINTECH, NUVABDF1, NUVTCPIP (any\n"
    "letter case; anything else gives a memory tag node).\n"
    "Run 'maroset project COMMAND --help' for the options of each command.\n";

const char* const ProjectCommands::InitUsage =
    "usage: maroset project init PATH\n"
    "\n"
    "Creates the project database PATH with an empty Nodes table. PATH must not exist.\n";

const char* const ProjectCommands::AddUsage =
    "usage: maroset project add PATH NAME DRIVER [--opc-server S] [--opc-topic T]\n"
    "                           [--update-rate MS] [--comm-port N] [--baud-rate B]\n"
    "                           [--tag-prefix P] [--ip-address A] [--port P]\n"
    "\n"
    "Adds the node NAME with driver DRIVER to the project database PATH. Columns without\n"
    "an option stay empty (NULL). Node names are unique in any letter case.\n"
    "\n"
    "Options (column in parentheses):\n"
    "  --opc-server S     OPC server name (OPCServer)\n"
    "  --opc-topic T      OPC access path (OPCTopic)\n"
    "  --update-rate MS   scan period in milliseconds (UpdateRate)\n"
    "  --comm-port N      serial port number (CommPort)\n"
    "  --baud-rate B      serial speed (BaudRate)\n"
    "  --tag-prefix P     text put before every tag address (TagPrefex)\n"
    "  --ip-address A     address of a TCP device (IPAddress)\n"
    "  --port P           TCP port of the device (Port)\n";

const char* const ProjectCommands::ListUsage =
    "usage: maroset project list PATH [--json]\n"
    "\n"
    "Lists the nodes of the project database PATH, one per line: name, driver and the\n"
    "columns that are set. With --json, one JSON object per node with every column.\n";

const char* const ProjectCommands::TagUsage =
    "usage: maroset project tag add PATH NODE HANDLE ADDRESS [--name NAME]\n"
    "       maroset project tag remove PATH NODE HANDLE\n"
    "       maroset project tag list PATH [--json]\n"
    "\n"
    "Edits the Tags table of the project database PATH: the tags `maroset serve` registers\n"
    "on each node (AddTag) before it starts scanning. HANDLE is 1 to 32767 and unique on its\n"
    "node; NAME defaults to the address.\n";

namespace {

int usageError(const char* usage, const std::string& message) {
    std::cerr << "maroset project: " << message << "\n" << usage;
    return 2;
}

int databaseError(const std::string& path, const VbError& e) {
    std::cerr << "maroset project: " << path << ": " << e.description() << " (error " << e.number()
              << ")\n";
    return 1;
}

}  // namespace

int ProjectCommands::Main(const std::vector<std::string>& args) {
    if (args.empty()) return usageError(Usage, "missing command");
    const std::string& command = args[0];
    const std::vector<std::string> rest(args.begin() + 1, args.end());
    if (command == "--help" || command == "-h") {
        std::cout << Usage;
        return 0;
    }
    if (command == "init") return Init(rest);
    if (command == "add") return Add(rest);
    if (command == "list") return List(rest);
    if (command == "tag") return Tag(rest);
    return usageError(Usage, "unknown command '" + command + "'");
}

int ProjectCommands::Init(const std::vector<std::string>& args) {
    CommandLine cl({});
    try {
        cl.parse(args);
        if (cl.help()) {
            std::cout << InitUsage;
            return 0;
        }
        cl.requireOperands(1, 1);
    } catch (const UsageError& e) {
        return usageError(InitUsage, e.what());
    }
    const std::string& path = cl.operands()[0];
    try {
        ProjectDatabase::Create(path);
    } catch (const VbError& e) {
        return databaseError(path, e);
    }
    std::cout << "Created project " << path << "\n";
    return 0;
}

int ProjectCommands::Add(const std::vector<std::string>& args) {
    // option, column, numeric
    struct ColumnOption {
        const char* option;
        const char* column;
        bool number;
    };
    static constexpr ColumnOption columns[] = {
        {"opc-server", "OPCServer", false},  {"opc-topic", "OPCTopic", false},
        {"update-rate", "UpdateRate", true}, {"comm-port", "CommPort", true},
        {"baud-rate", "BaudRate", true},     {"tag-prefix", "TagPrefex", false},
        {"ip-address", "IPAddress", false},  {"port", "Port", true},
    };
    std::vector<CommandLine::Option> options;
    for (const auto& c : columns) options.push_back({c.option, true});
    CommandLine cl(options);
    std::vector<ProjectDatabase::Field> fields;
    try {
        cl.parse(args);
        if (cl.help()) {
            std::cout << AddUsage;
            return 0;
        }
        cl.requireOperands(3, 3);
        if (cl.operands()[1].empty()) throw UsageError("NAME must not be empty");
        fields.emplace_back("Name", Variant(cl.operands()[1]));
        fields.emplace_back("Driver", Variant(cl.operands()[2]));
        for (const auto& c : columns) {
            if (c.number) {
                if (auto n = cl.integer(c.option, 0, 2147483647))
                    fields.emplace_back(c.column, Variant(*n));
            } else if (auto text = cl.value(c.option)) {
                fields.emplace_back(c.column, Variant(*text));
            }
        }
    } catch (const UsageError& e) {
        return usageError(AddUsage, e.what());
    }
    const std::string& path = cl.operands()[0];
    try {
        ProjectDatabase::AddNode(path, fields);
    } catch (const VbError& e) {
        if (e.number() == err::DuplicateKey) {
            std::cerr << "maroset project: " << path << " already has a node named '"
                      << cl.operands()[1] << "'\n";
            return 1;
        }
        return databaseError(path, e);
    }
    std::cout << "Added node " << cl.operands()[1] << " (" << cl.operands()[2] << ") to " << path
              << "\n";
    return 0;
}

int ProjectCommands::List(const std::vector<std::string>& args) {
    CommandLine cl({{"json"}});
    try {
        cl.parse(args);
        if (cl.help()) {
            std::cout << ListUsage;
            return 0;
        }
        cl.requireOperands(1, 1);
    } catch (const UsageError& e) {
        return usageError(ListUsage, e.what());
    }
    const std::string& path = cl.operands()[0];
    std::vector<std::vector<Variant>> rows;
    try {
        rows = ProjectDatabase::Rows(path);
    } catch (const VbError& e) {
        return databaseError(path, e);
    }
    const auto& names = ProjectDatabase::Columns;
    if (cl.has("json")) {
        for (const auto& row : rows) {
            JsonWriter j;
            j.beginObject();
            for (size_t i = 0; i < names.size(); ++i) j.key(names[i]).value(row[i]);
            std::cout << j.endObject().str() << "\n";
        }
        return 0;
    }
    if (rows.empty()) {
        std::cout << "No nodes in " << path << "\n";
        return 0;
    }
    // Text of a column as the list shows it: text as it is, other values readable.
    auto shown = [](const Variant& v) {
        return v.isString() ? v.string() : EventPrinter::Readable(v);
    };
    size_t nameWidth = 4, driverWidth = 6;
    for (const auto& row : rows) {
        nameWidth = std::max(nameWidth, shown(row[0]).size());
        driverWidth = std::max(driverWidth, shown(row[1]).size());
    }
    auto pad = [](std::string text, size_t width) {
        text.resize(std::max(text.size(), width), ' ');
        return text;
    };
    std::cout << pad("Name", nameWidth) << "  " << pad("Driver", driverWidth) << "  Settings\n";
    for (const auto& row : rows) {
        std::string line = pad(shown(row[0]), nameWidth) + "  " + pad(shown(row[1]), driverWidth);
        std::string settings;
        for (size_t i = 2; i < names.size(); ++i) {
            if (row[i].isNull() || row[i].isEmpty()) continue;
            settings += std::string(settings.empty() ? "" : " ") + names[i] + "=" + shown(row[i]);
        }
        line += "  " + settings;
        while (!line.empty() && line.back() == ' ') line.pop_back();
        std::cout << line << "\n";
    }
    return 0;
}

int ProjectCommands::Tag(const std::vector<std::string>& args) {
    const std::string command = args.empty() ? "" : args[0];
    const std::vector<std::string> rest(args.begin() + (args.empty() ? 0 : 1), args.end());
    CommandLine cl({{"name", true}, {"json"}});
    try {
        cl.parse(rest);
        if (cl.help() || command == "--help" || command == "-h") {
            std::cout << TagUsage;
            return 0;
        }
        if (command == "add")
            cl.requireOperands(4, 4);
        else if (command == "remove")
            cl.requireOperands(3, 3);
        else if (command == "list")
            cl.requireOperands(1, 1);
        else
            throw UsageError(command.empty() ? "missing command"
                                             : "unknown command '" + command + "'");
        if (cl.has("name") && command != "add") throw UsageError("--name goes with add only");
        if (cl.has("json") && command != "list") throw UsageError("--json goes with list only");
    } catch (const UsageError& e) {
        return usageError(TagUsage, e.what());
    }
    const auto& ops = cl.operands();
    const std::string& path = ops[0];
    std::optional<int32_t> handle;
    if (command != "list") {
        handle = CommandLine::ParseInteger(ops[2]);
        if (!handle || *handle < 1 || *handle > gateway::TagTable::MaxHandle)
            return usageError(
                TagUsage, "HANDLE must be a whole number from 1 to 32767, not '" + ops[2] + "'");
    }
    try {
        if (command == "add") {
            gateway::TagTable::Add(path, {ops[1], *handle, ops[3], cl.value("name").value_or("")});
            std::cout << "Added tag " << *handle << " (" << ops[3] << ") on " << ops[1] << " to "
                      << path << "\n";
            return 0;
        }
        if (command == "remove") {
            if (!gateway::TagTable::Remove(path, ops[1], *handle)) {
                std::cerr << "maroset project: " << path << " has no tag " << *handle << " on "
                          << ops[1] << "\n";
                return 1;
            }
            std::cout << "Removed tag " << *handle << " on " << ops[1] << " from " << path << "\n";
            return 0;
        }
        const auto rows = gateway::TagTable::Rows(path);
        if (cl.has("json")) {
            for (const auto& row : rows) {
                JsonWriter j;
                j.beginObject().key("node").string(row.node).key("handle").integer(row.handle);
                j.key("address").string(row.address).key("name").string(row.name);
                std::cout << j.endObject().str() << "\n";
            }
            return 0;
        }
        if (rows.empty()) std::cout << "No tags in " << path << "\n";
        for (const auto& row : rows) {
            std::cout << row.node << " " << row.handle << " " << row.address;
            if (row.name != row.address) std::cout << " (" << row.name << ")";
            std::cout << "\n";
        }
        return 0;
    } catch (const VbError& e) {
        if (e.number() == err::DuplicateKey) {
            std::cerr << "maroset project: " << path << " already has tag " << *handle << " on "
                      << ops[1] << "\n";
            return 1;
        }
        return databaseError(path, e);
    }
}

}  // namespace maroset::cli
