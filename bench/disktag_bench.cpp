// The cost of a disk tag write and read, against plain SQLite doing the same work: open the
// file, find the row with the query, update it (or read it), close. Both sides write with
// SQLite's default full synchronous mode, so a write costs about the same fsyncs either way;
// what remains is the driver's own overhead (Jet like, recordset, text conversion, report).
#include <benchmark/benchmark.h>
#include <sqlite3.h>
#include <stdlib.h>

#include <filesystem>
#include <memory>
#include <string>

#include "BenchRuntime.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "drivers/local/ClsDriverDiskTag.h"

namespace {

using namespace maroset;
namespace fs = std::filesystem;

constexpr int kTags = 100;

// A drive root of its own with Line1.mdb holding kTags rows, the tag "Level" among them.
class DiskTagSetup {
  public:
    DiskTagSetup() {
        std::string pattern = (fs::temp_directory_path() / "maroset-disktag-XXXXXX").string();
        root_ = ::mkdtemp(pattern.data());
        scope_ = std::make_unique<ScopedRuntime>(bench::VirtualRuntime(nullptr, root_));
        driver.startup("ServerName", "Line1");
        for (int i = 0; i < kTags; ++i)
            driver.AddItem(i == kTags / 2 ? "Level" : "Tag" + std::to_string(i),
                           static_cast<int16_t>(i + 1));
    }
    ~DiskTagSetup() {
        scope_.reset();
        std::error_code ec;
        fs::remove_all(root_, ec);
    }
    fs::path file() const { return root_ / "NUVDiskIO" / "Line1.mdb"; }
    static constexpr int32_t kLevel = kTags / 2 + 1;

    ClsDriverDiskTag driver;

  private:
    fs::path root_;
    std::unique_ptr<ScopedRuntime> scope_;
};

void DiskTagWriteItem(benchmark::State& state) {
    DiskTagSetup setup;
    double value = 0;
    for (auto _ : state) setup.driver.WriteItem(DiskTagSetup::kLevel, Variant(value += 0.5));
}
BENCHMARK(DiskTagWriteItem)->Unit(benchmark::kMicrosecond);

void DiskTagReadItem(benchmark::State& state) {
    DiskTagSetup setup;
    for (auto _ : state) setup.driver.ReadItem(DiskTagSetup::kLevel);
}
BENCHMARK(DiskTagReadItem)->Unit(benchmark::kMicrosecond);

// Plain SQLite, as the driver does it: open the file afresh and run the row query.
sqlite3_stmt* openAndFind(const std::string& path, sqlite3*& db) {
    sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    sqlite3_busy_timeout(db, 5000);
    sqlite3_stmt* find = nullptr;
    sqlite3_prepare_v2(db, "select * from TagValues  where TagName like 'Level'", -1, &find,
                       nullptr);
    return find;
}

// Plain SQLite: the same query with SQLite's own LIKE, then the update by key. One step of
// each side is a function of its own, so a profiler can count it alone.
[[gnu::noinline]] void PlainWrite(const std::string& path, double value) {
    sqlite3* db = nullptr;
    sqlite3_stmt* find = openAndFind(path, db);
    if (sqlite3_step(find) == SQLITE_ROW) {
        const sqlite3_int64 id = sqlite3_column_int64(find, 0);
        sqlite3_finalize(find);
        find = nullptr;
        sqlite3_stmt* update = nullptr;
        sqlite3_prepare_v2(db, "UPDATE TagValues SET TagValue = ?1 WHERE ID = ?2", -1, &update,
                           nullptr);
        const std::string text = std::to_string(value);
        sqlite3_bind_text(update, 1, text.c_str(), -1, SQLITE_TRANSIENT);
        sqlite3_bind_int64(update, 2, id);
        sqlite3_step(update);
        sqlite3_finalize(update);
    }
    sqlite3_finalize(find);
    sqlite3_close(db);
}

[[gnu::noinline]] void PlainRead(const std::string& path) {
    sqlite3* db = nullptr;
    sqlite3_stmt* find = openAndFind(path, db);
    if (sqlite3_step(find) == SQLITE_ROW) {
        std::string text(reinterpret_cast<const char*>(sqlite3_column_text(find, 2)));
        benchmark::DoNotOptimize(text);
    }
    sqlite3_finalize(find);
    sqlite3_close(db);
}

void SqliteWrite(benchmark::State& state) {
    DiskTagSetup setup;
    const std::string path = setup.file().string();
    double value = 0;
    for (auto _ : state) PlainWrite(path, value += 0.5);
}
BENCHMARK(SqliteWrite)->Unit(benchmark::kMicrosecond);

void SqliteRead(benchmark::State& state) {
    DiskTagSetup setup;
    const std::string path = setup.file().string();
    for (auto _ : state) PlainRead(path);
}
BENCHMARK(SqliteRead)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
