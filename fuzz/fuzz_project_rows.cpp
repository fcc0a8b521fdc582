// A project database is a file someone made with whatever tool they had: any field of a row
// may be Null, a number of any size, or text of any length, and the rows may name nodes twice.
// AddAllNodes takes them in order; a row it cannot take is a run-time error, never a crash, and
// the nodes it made come out again with RemoveAllNodes.
//
// Input: rows of the ten fields of Nodes, each field [kind][bytes...]: kind % 5 is 0 Null,
// 1 an integer (8 bytes), 2 a real (8 bytes), else text ([length][bytes]); Driver's text is
// one of the families' names in some letter case ([index]).
#include <sqlite3.h>
#include <unistd.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "lang/VbError.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

#include "FuzzInput.h"
#include "FuzzRuntime.h"

namespace {

using namespace maroset;
namespace fs = std::filesystem;

// Every family but the coupler's, whose Modbus library would connect to the address the row
// gives; serial ports meet in-memory cables, TCP connections the in-memory network.
constexpr const char* kDrivers[] = {"MEMTAG", "DiskTag", "opc", "NUVINTECH", "NuvAbDf1",
                                    "NUVTCPIP", "", "WAGO"};

// Built once: the runtime, its cables, and the project file with its table; each input only
// replaces the rows.
struct Project {
    Project() : root(MakeRoot()), scope(fuzz::VirtualRuntime(loop, root)) {
        scope->tcp().setRealSockets(false);
        for (int i = 0; i < 64; ++i) {
            cables.push_back(std::make_unique<platform::MemorySerialCable>(*loop));
            scope->serialDevices().plug("/dev/ttyS" + std::to_string(i), cables.back()->hostEnd());
        }
        file = root / "Project.mdb";
        sqlite3_open(file.c_str(), &db);
        sqlite3_exec(db,
                     "PRAGMA journal_mode = MEMORY; PRAGMA synchronous = OFF;"
                     "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT,"
                     " UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT,"
                     " IPAddress TEXT, Port INTEGER)",
                     nullptr, nullptr, nullptr);
        sqlite3_prepare_v2(db, "INSERT INTO Nodes VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?, ?)", -1,
                           &insert, nullptr);
    }

    // tmpfs where there is one: disk tag nodes create and sync files. libFuzzer ends the
    // process without running destructors, so a folder whose process is gone is removed here.
    static fs::path MakeRoot() {
        const fs::path base = fs::is_directory("/dev/shm") ? "/dev/shm" : fs::temp_directory_path();
        std::error_code ec;
        for (const auto& entry : fs::directory_iterator(base, ec)) {
            const std::string name = entry.path().filename();
            if (name.rfind("maroset-fuzz-rows-", 0) == 0 &&
                !fs::exists("/proc/" + name.substr(18), ec))
                fs::remove_all(entry.path(), ec);
        }
        const fs::path root = base / ("maroset-fuzz-rows-" + std::to_string(::getpid()));
        fs::remove_all(root, ec);
        fs::create_directory(root, ec);
        return root;
    }

    fs::path root;
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope;
    std::vector<std::unique_ptr<platform::MemorySerialCable>> cables;
    fs::path file;
    sqlite3* db = nullptr;
    sqlite3_stmt* insert = nullptr;
};

void BindField(sqlite3_stmt* s, int column, fuzz::FuzzInput& in) {
    const uint8_t kind = in.byte();
    switch (kind % 5) {
        case 0:
            sqlite3_bind_null(s, column);
            break;
        case 1:
            sqlite3_bind_int64(s, column, in.number<int64_t>());
            break;
        case 2:
            sqlite3_bind_double(s, column, in.number<double>());
            break;
        default:
            // Driver text is always one of the list, so WAGOIO is never written; "WAGO"
            // stands for a name no family has.
            if (column == 2) {
                const char* name = kDrivers[in.byte() % std::size(kDrivers)];
                sqlite3_bind_text(s, column, name, -1, SQLITE_STATIC);
                break;
            }
            const std::string text = in.bytes(in.byte() % 48);
            sqlite3_bind_text(s, column, text.data(), static_cast<int>(text.size()),
                              SQLITE_TRANSIENT);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static Project project;
    fuzz::FuzzInput in{data, size};
    sqlite3_exec(project.db, "DELETE FROM Nodes", nullptr, nullptr, nullptr);
    for (int row = 0; row < 6 && in.more(); ++row) {
        for (int column = 1; column <= 10; ++column) BindField(project.insert, column, in);
        sqlite3_step(project.insert);
        sqlite3_reset(project.insert);
    }

    auto nodes = project.scope->nodes();
    try {
        nodes->AddAllNodes(project.file.string());
    } catch (const VbError&) {
        // A row the nodes cannot take: as it reaches a host with the trap off.
    }
    project.loop->advance(std::chrono::milliseconds(0));
    try {
        nodes->RemoveAllNodes();
    } catch (const VbError&) {
        // A node whose driver never started fails to stop (91): the others go by name.
        for (const auto& n : nodes->nodes()) {
            try {
                nodes->RemoveNode(n->Name);
            } catch (const VbError&) {
            }
        }
    }
    if (!nodes->nodes().empty()) std::abort();
    project.loop->advance(std::chrono::milliseconds(0));
    std::error_code ec;
    fs::remove_all(project.root / "NUVDiskIO", ec);
    return 0;
}
