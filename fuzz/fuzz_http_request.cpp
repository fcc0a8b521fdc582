// Requests to the service's API as a client could send them: any method, any path, any body,
// with and without the token, against a served memory-tag project with writes allowed. Every
// answer is a status the API documents with a JSON body (or the page, the metrics, a stream),
// and nothing a client sends stops the process.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"
#include "gateway/EventStream.h"
#include "gateway/JsonReader.h"
#include "gateway/ServeApi.h"
#include "gateway/TagBook.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"

using namespace maroset;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    auto loop = std::make_unique<platform::VirtualEventLoop>();
    platform::VirtualEventLoop& virtualLoop = *loop;
    auto clock = std::make_unique<platform::VirtualClock>(virtualLoop, platform::ZeroDate);
    ScopedRuntime scope(
        std::make_unique<Runtime>(std::move(loop), std::move(clock),
                                  std::filesystem::temp_directory_path() / "maroset-fuzz-http"));
    Runtime& rt = *scope;
    ClsNodeDBInterface host;
    nodeDB& db = *host.nodeDB();
    db.AddNode("Mem", "MEMTAG");
    db.getNode("Mem")->AddTag(1, "Setpoint");
    gateway::TagBook tags(rt.reports(), rt.clock(), {{"Mem", 1, "Setpoint", "Setpoint"}});
    gateway::EventStream events(rt.loop(), rt.reports(), rt.linkStatus(), rt.clock());
    gateway::ServeApi api(db, rt.linkStatus(), tags, events, {true, "t"});

    // First byte: method and token; then the path up to the first newline; the rest is the body.
    const std::string input(reinterpret_cast<const char*>(data), size);
    if (input.empty()) return 0;
    static const char* const methods[] = {"GET", "POST", "HEAD", "PUT"};
    gateway::HttpRequest request;
    request.method = methods[static_cast<uint8_t>(input[0]) & 3];
    if (input[0] & 4) request.authorization = "Bearer t";
    const size_t newline = input.find('\n', 1);
    request.path = input.substr(1, newline == std::string::npos ? std::string::npos : newline - 1);
    if (newline != std::string::npos) request.body = input.substr(newline + 1);

    const gateway::HttpResponse response = api.handle(request);
    switch (response.status) {
        case 200:
        case 400:
        case 401:
        case 403:
        case 404:
        case 405:
            break;
        default:
            std::abort();
    }
    if (response.contentType == "application/json") {
        try {
            gateway::JsonReader::Parse(response.body);
        } catch (const gateway::JsonReader::Error&) {
            std::abort();  // the API answers JSON its own reader takes back
        }
    }
    virtualLoop.advance(std::chrono::milliseconds(1));
    db.RemoveAllNodes();
    return 0;
}
