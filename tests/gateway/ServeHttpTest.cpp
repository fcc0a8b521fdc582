#include "gateway/WebService.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>

#include "core/ClsNodeDBInterface.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"
#include "gateway/JsonReader.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "support/HttpClient.h"
#include "support/TempDir.h"

namespace maroset {
namespace {

using gateway::JsonReader;
using gateway::JsonValue;
using gateway::WebService;

// A memory-tag project served on a free loopback port, on the real loop and clock.
class ServeHttp : public ::testing::Test {
  protected:
    ServeHttp() {
        db().AddNode("Mem", "MEMTAG", "", 0, 0);
        const auto tags = gateway::TagTable::Register(
            db(), {{"Mem", 1, "Setpoint", "Set point"}, {"Mem", 2, "Running", "Running"}},
            [](const std::string& line) { ADD_FAILURE() << line; });
        rows_ = tags;
        db().StartScanning();
    }

    nodeDB& db() { return *host_.nodeDB(); }
    platform::EventLoop& loop() { return scope_->loop(); }

    // Serves with these settings (port 0 whatever they say).
    test::HttpClient& serve(WebService::Settings settings = {}) {
        settings.port = 0;
        service_.emplace(db(), rows_, settings);
        client_ = std::make_unique<test::HttpClient>(loop(), service_->port());
        return *client_;
    }
    static WebService::Settings writable(std::string token = "") {
        WebService::Settings s;
        s.allowWrites = true;
        s.token = std::move(token);
        return s;
    }
    static JsonValue json(const test::HttpClient::Response& r) { return JsonReader::Parse(r.body); }
    // The status and the message of an API error.
    static std::string refusal(const test::HttpClient::Response& r) {
        const JsonValue v = json(r);
        EXPECT_EQ(v.member("ok")->boolean, false);
        const JsonValue* error = v.member("error");
        EXPECT_EQ(error->member("status")->number, r.status);
        return std::to_string(r.status) + " " + error->member("message")->text;
    }

    test::TempDir drive_;
    ScopedRuntime scope_{std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                                   std::make_unique<platform::SystemClock>(),
                                                   drive_.path())};
    ClsNodeDBInterface host_;
    std::vector<gateway::TagTable::Row> rows_;
    std::optional<WebService> service_;
    std::unique_ptr<test::HttpClient> client_;
};

TEST_F(ServeHttp, NodesTagsMetricsAndThePageAnswerAsDocumented) {
    auto& http = serve();
    EXPECT_EQ(service_->url().substr(0, 17), "http://127.0.0.1:");

    const auto nodes = http.request("GET", "/api/nodes");
    ASSERT_EQ(nodes.status, 200);
    EXPECT_NE(nodes.headers.find("Content-Type: application/json"), std::string::npos);
    const JsonValue list = json(nodes);
    ASSERT_EQ(list.items.size(), 1u);
    const JsonValue& mem = list.items[0];
    EXPECT_EQ(mem.member("name")->text, "Mem");
    EXPECT_EQ(mem.member("driver")->text, "MEMTAG");
    const JsonValue* link = mem.member("link");
    EXPECT_EQ(link->member("state")->text, "local");
    EXPECT_EQ(link->member("since")->text.size(), 23u);  // 2026-03-07T09:00:00.000
    for (const char* counter : {"requests", "replies", "timeouts", "retries", "badChecks",
                                "reconnects", "values", "driverErrors"})
        EXPECT_NE(link->member("counters")->member(counter), nullptr) << counter;
    EXPECT_EQ(link->member("last")->kind, JsonValue::Kind::Null);

    const auto tags = json(http.request("GET", "/api/tags"));
    ASSERT_EQ(tags.items.size(), 2u);
    const JsonValue& set = tags.items[0];
    EXPECT_EQ(set.member("node")->text, "Mem");
    EXPECT_EQ(set.member("handle")->number, 1);
    EXPECT_EQ(set.member("address")->text, "Setpoint");
    EXPECT_EQ(set.member("name")->text, "Set point");
    EXPECT_EQ(set.member("value")->kind, JsonValue::Kind::Null);
    EXPECT_EQ(set.member("type")->text, "Empty");
    EXPECT_EQ(set.member("time")->kind, JsonValue::Kind::Null);
    EXPECT_EQ(set.member("changes")->number, 0);

    const auto metrics = http.request("GET", "/metrics");
    ASSERT_EQ(metrics.status, 200);
    EXPECT_NE(metrics.headers.find("text/plain; version=0.0.4"), std::string::npos);
    EXPECT_NE(metrics.body.find("maroset_values_total{node=\"Mem\",driver=\"MEMTAG\"} 0\n"),
              std::string::npos);
    EXPECT_NE(
        metrics.body.find("maroset_link_state{node=\"Mem\",driver=\"MEMTAG\",state=\"local\"} 1\n"),
        std::string::npos);
    EXPECT_NE(
        metrics.body.find("maroset_link_state{node=\"Mem\",driver=\"MEMTAG\",state=\"up\"} 0\n"),
        std::string::npos);

    const auto page = http.request("GET", "/");
    ASSERT_EQ(page.status, 200);
    EXPECT_NE(page.headers.find("Content-Type: text/html"), std::string::npos);
    EXPECT_NE(page.body.find("<html"), std::string::npos);
}

TEST_F(ServeHttp, AWriteReachesTheNodeAndShowsInTheTagsAndTheMetrics) {
    auto& http = serve(writable());
    const auto r = http.request("POST", "/api/tags/mem/1", R"({"value": 12.5})");
    ASSERT_EQ(r.status, 200) << r.body;
    EXPECT_EQ(r.body, R"({"ok":true})");
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/2", R"({"value": true})").body, R"({"ok":true})");
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/2", R"({"value": "caf\u00e9"})").body,
              R"({"ok":true})");

    const auto tags = json(http.request("GET", "/api/tags"));
    EXPECT_EQ(tags.items[0].member("value")->number, 12.5);
    EXPECT_EQ(tags.items[0].member("type")->text, "Double");
    EXPECT_EQ(tags.items[0].member("changes")->number, 1);
    EXPECT_EQ(tags.items[0].member("time")->kind, JsonValue::Kind::String);
    EXPECT_EQ(tags.items[1].member("value")->text, "caf\xE9");
    EXPECT_EQ(tags.items[1].member("type")->text, "String");
    EXPECT_EQ(tags.items[1].member("changes")->number, 2);
    EXPECT_NE(http.request("GET", "/metrics")
                  .body.find("maroset_values_total{node=\"Mem\",driver=\"MEMTAG\"} 3\n"),
              std::string::npos);
}

TEST_F(ServeHttp, WritesAreRefusedUnlessAllowedAndAuthorised) {
    auto& http = serve();
    EXPECT_EQ(refusal(http.request("POST", "/api/tags/Mem/1", R"({"value":1})")),
              "403 writes are not allowed");
    // The page learns from /api/info whether to offer write boxes and a token field.
    EXPECT_EQ(http.request("GET", "/api/info").body, R"({"writes":false,"token":false})");
    service_.reset();

    auto& guarded = serve(writable("s3cret"));
    EXPECT_EQ(guarded.request("GET", "/api/info").body, R"({"writes":true,"token":true})");
    EXPECT_EQ(guarded.request("POST", "/api/tags/Mem/1", R"({"value":1})").status, 401);
    EXPECT_EQ(
        guarded
            .request("POST", "/api/tags/Mem/1", R"({"value":1})", {"Authorization: Bearer s3cre"})
            .status,
        401);
    EXPECT_EQ(
        guarded
            .request("POST", "/api/tags/Mem/1", R"({"value":1})", {"Authorization: Bearer s3cret"})
            .body,
        R"({"ok":true})");
    // Reads never need the token.
    EXPECT_EQ(guarded.request("GET", "/api/tags").status, 200);
}

TEST_F(ServeHttp, AnAddressBeyondLoopbackWithoutTokenRefusesWritesWhateverTheFlag) {
    EXPECT_TRUE(WebService::IsLoopback("127.0.0.1"));
    EXPECT_TRUE(WebService::IsLoopback("127.1.2.3"));
    EXPECT_FALSE(WebService::IsLoopback("0.0.0.0"));
    EXPECT_FALSE(WebService::IsLoopback("192.168.1.10"));
    EXPECT_FALSE(WebService::IsLoopback("localhost"));

    auto open = writable();
    open.host = "0.0.0.0";
    auto& http = serve(open);
    EXPECT_FALSE(service_->writesAllowed());
    EXPECT_EQ(http.request("GET", "/api/info").body, R"({"writes":false,"token":false})");
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/1", R"({"value":1})").status, 403);
    service_.reset();

    auto withToken = writable("t");
    withToken.host = "0.0.0.0";
    serve(withToken);
    EXPECT_TRUE(service_->writesAllowed());
}

TEST_F(ServeHttp, BadRequestsGetTheirStatusWithAJsonError) {
    auto& http = serve(writable());
    EXPECT_EQ(refusal(http.request("POST", "/api/tags/Pump/1", R"({"value":1})")),
              "404 no node named 'Pump'");
    EXPECT_EQ(refusal(http.request("POST", "/api/tags/Mem/9", R"({"value":1})")),
              "404 no tag 9 on Mem");
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/x", R"({"value":1})").status, 404);
    EXPECT_EQ(http.request("POST", "/api/tags/Mem", R"({"value":1})").status, 404);
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/1/2", R"({"value":1})").status, 404);
    EXPECT_EQ(refusal(http.request("GET", "/nowhere")), "404 no such path");
    EXPECT_EQ(refusal(http.request("GET", "/api/tags/Mem/1")), "405 method not allowed");
    EXPECT_EQ(http.request("DELETE", "/api/nodes").status, 405);

    for (const char* body :
         {"", "{", R"({"value":})", R"({"value":1} x)", "[1]", R"({"v":1})", R"({"value":{"a":1}})",
          R"({"value":"\u20ac"})", "{\"value\":\"\xff\"}"}) {
        const auto r = http.request("POST", "/api/tags/Mem/1", body);
        EXPECT_EQ(r.status, 400) << body;
        EXPECT_EQ(json(r).member("error")->member("status")->number, 400) << body;
    }

    const std::string big = R"({"value":")" + std::string(70 * 1024, 'x') + R"("})";
    EXPECT_EQ(refusal(http.request("POST", "/api/tags/Mem/1", big)),
              "413 request body over 65536 bytes");
    // The server goes on serving after each refusal.
    EXPECT_EQ(http.request("POST", "/api/tags/Mem/1", R"({"value":[1,2]})").status, 200);
}

TEST_F(ServeHttp, TheEventStreamDeliversTheValuesOfOneLoopTurnAsOneEvent) {
    auto& http = serve();
    test::HttpClient::Stream events(http, "/api/events");
    ASSERT_TRUE(events.waitFor(": maroset events\n\n"));
    EXPECT_NE(events.received().find("Content-Type: text/event-stream"), std::string::npos);

    auto n = db().getNode("Mem");
    n->WriteTag("1", Variant(7));
    n->WriteTag("2", Variant(false));
    ASSERT_TRUE(events.waitFor("}]\n\n"));
    const std::string& got = events.received();
    const auto at = got.find("event: values\ndata: [");
    ASSERT_NE(at, std::string::npos) << got;
    EXPECT_NE(got.find(R"({"node":"Mem","handle":1,"value":7,"time":")", at), std::string::npos);
    EXPECT_NE(got.find(R"({"node":"Mem","handle":2,"value":false,"time":")", at),
              std::string::npos);
    EXPECT_EQ(got.find("event: values", at + 1), std::string::npos) << "one event for the turn";

    // Later values come as they happen, to a stream that sat idle in between.
    loop().runFor(std::chrono::milliseconds(50));
    n->WriteTag("1", Variant(8));
    EXPECT_TRUE(events.waitFor(R"("handle":1,"value":8)"));
}

TEST_F(ServeHttp, ConnectionsBeyondTheLimitWaitWhileTheOthersAreServed) {
    auto& http = serve();
    std::vector<std::unique_ptr<test::HttpClient::Stream>> streams;
    for (int i = 0; i < 64; ++i) {
        streams.push_back(std::make_unique<test::HttpClient::Stream>(http, "/api/events"));
        ASSERT_TRUE(streams.back()->waitFor(": maroset events")) << i;
    }
    test::HttpClient::Stream extra(http, "/api/events");
    EXPECT_FALSE(extra.waitFor(": maroset events", std::chrono::milliseconds(300)));
    db().getNode("Mem")->WriteTag("1", Variant(1));
    for (auto& s : streams) ASSERT_TRUE(s->waitFor("event: values"));
    EXPECT_EQ(extra.received(), "");
}

}  // namespace
}  // namespace maroset
