// Values from a driver's report into the service's event stream, read by a client on
// loopback, beside the memory-tag path (host write -> driver -> host event) in the same run.
#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <benchmark/benchmark.h>

#include <memory>
#include <string>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/ValueReport.h"
#include "core/nodeDB.h"
#include "gateway/WebService.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"

namespace {

using namespace maroset;

std::unique_ptr<Runtime> RealRuntime() {
    return std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                     std::make_unique<platform::SystemClock>(),
                                     std::filesystem::temp_directory_path() / "maroset-bench");
}

// A project of one memory-tag node with `tags` tags, served on a free loopback port.
struct ServedProject {
    explicit ServedProject(int32_t tags) {
        db.AddNode("Mem", "MEMTAG");
        mem = db.getNode("Mem");
        std::vector<gateway::TagTable::Row> rows;
        for (int32_t h = 1; h <= tags; ++h) {
            mem->AddTag(h, "T" + std::to_string(h));
            rows.push_back({"Mem", h, "T" + std::to_string(h), "T" + std::to_string(h)});
        }
        gateway::WebService::Settings settings;
        settings.port = 0;
        service = std::make_unique<gateway::WebService>(db, rows, settings);
    }
    ~ServedProject() {
        service.reset();
        db.RemoveAllNodes();
    }

    ClsNodeDBInterface host;
    nodeDB& db = *host.nodeDB();
    std::shared_ptr<maroset::node> mem;
    std::unique_ptr<gateway::WebService> service;
};

// A plain socket reading the event stream (HTTP/1.0: no chunks, the events as they are).
int OpenEvents(uint16_t port) {
    const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (::connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0) return -1;
    const std::string request = "GET /api/events HTTP/1.0\r\n\r\n";
    if (::send(fd, request.data(), request.size(), MSG_NOSIGNAL) < 0) return -1;
    ::fcntl(fd, F_SETFL, O_NONBLOCK);
    return fd;
}

// Runs the loop and reads until what was read ends with `end`; the bytes read.
size_t ReadUntil(platform::EventLoop& loop, int fd, std::string_view end, std::string& tail) {
    static char buffer[1 << 20];
    size_t total = 0;
    for (;;) {
        loop.pump();
        const ssize_t n = ::recv(fd, buffer, sizeof buffer, 0);
        if (n <= 0) continue;
        total += static_cast<size_t>(n);
        tail.append(buffer, static_cast<size_t>(n));
        if (tail.size() > 64) tail.erase(0, tail.size() - 64);
        if (tail.size() >= end.size() &&
            tail.compare(tail.size() - end.size(), end.size(), end) == 0)
            return total;
    }
}

// One scan's report of range(0) values per loop turn, from the driver into the stream.
void DriverReportsIntoTheEventStream(benchmark::State& state) {
    ScopedRuntime scope(RealRuntime());
    const auto perTurn = static_cast<int32_t>(state.range(0));
    ServedProject project(perTurn);
    platform::EventLoop& loop = scope->loop();
    const int fd = OpenEvents(project.service->port());
    std::string tail;
    ReadUntil(loop, fd, ": maroset events\n\n", tail);

    std::vector<int32_t> ids(static_cast<size_t>(perTurn));
    for (int32_t i = 0; i < perTurn; ++i) ids[static_cast<size_t>(i)] = i + 1;
    VbArray<int32_t> handles(1, ids);
    VbArray<Variant> values(1, perTurn);
    int64_t turn = 0;
    size_t bytes = 0;
    const Driver& driver = *project.mem->driver();
    for (auto _ : state) {
        ++turn;
        for (int32_t i = 1; i <= perTurn; ++i)
            values(i) = Variant(static_cast<double>(turn) + i / 8.0);
        ReportValues(driver, handles, values);
        bytes += ReadUntil(loop, fd, "]\n\n", tail);
    }
    ::close(fd);
    state.SetItemsProcessed(state.iterations() * perTurn);
    state.SetBytesProcessed(static_cast<int64_t>(bytes));
}
BENCHMARK(DriverReportsIntoTheEventStream)->Arg(1)->Arg(100)->Arg(1000)->Arg(10000);

// The memory-tag path a host sees, measured in the same run: WriteTag -> driver -> host event.
void MemoryTagWriteToHostEvent(benchmark::State& state) {
    ScopedRuntime scope(RealRuntime());
    ClsNodeDBInterface host;
    int64_t received = 0;
    auto sub = host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t n, VbArray<Variant>&) { received += n; });
    auto& db = *host.nodeDB();
    db.AddNode("Mem", "MEMTAG");
    const auto n = db.getNode("Mem");
    n->AddTag(1, "Level");
    const Variant value(3.5);
    for (auto _ : state) n->WriteTag("1", value);
    state.SetItemsProcessed(received);
    db.RemoveAllNodes();
}
BENCHMARK(MemoryTagWriteToHostEvent);

// The same memory-tag path with the service attached and a client on the stream: what serving
// adds to each value a driver reports.
void MemoryTagWriteWithTheServiceListening(benchmark::State& state) {
    ScopedRuntime scope(RealRuntime());
    ServedProject project(1);
    platform::EventLoop& loop = scope->loop();
    const int fd = OpenEvents(project.service->port());
    std::string tail;
    ReadUntil(loop, fd, ": maroset events\n\n", tail);
    const Variant value(3.5);
    for (auto _ : state) {
        for (int i = 0; i < 1000; ++i) project.mem->WriteTag("1", value);
        ReadUntil(loop, fd, "]\n\n", tail);
    }
    ::close(fd);
    state.SetItemsProcessed(state.iterations() * 1000);
}
BENCHMARK(MemoryTagWriteWithTheServiceListening);

}  // namespace

BENCHMARK_MAIN();
