#include "gateway/EventStream.h"

#include <gtest/gtest.h>

#include <string>

#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using gateway::EventStream;

// The stream on the virtual loop, fed through the report tap as drivers feed it.
class EventStreamTest : public test::RuntimeFixture {
  protected:
    void report(const char* node, std::vector<int32_t> handles, std::vector<Variant> values) {
        const auto count = static_cast<int16_t>(handles.size());
        runtime().reports().Values.raise(node, VbArray<int32_t>(1, std::move(handles)), count,
                                         VbArray<Variant>(1, std::move(values)));
    }
    static std::string readAll(EventStream::Client& c) {
        std::string out;
        char buffer[512];
        while (const size_t n = c.read(buffer, sizeof buffer)) out.append(buffer, n);
        return out;
    }

    EventStream stream_{runtime().loop(), runtime().reports(), runtime().linkStatus(),
                        runtime().clock()};
};

TEST_F(EventStreamTest, ReportsOfOneTurnBecomeOneValuesEventWhenTheTurnEnds) {
    auto client = stream_.connect();
    int woken = 0;
    client->ready = [&] { ++woken; };
    EXPECT_EQ(readAll(*client), ": maroset events\n\n");

    report("Line1", {5, 6}, {Variant(1), Variant("a\"b")});
    report("Mem", {5}, {Variant(2.5)});
    EXPECT_EQ(readAll(*client), "") << "nothing before the turn ends";
    advance(std::chrono::milliseconds(0));
    EXPECT_EQ(woken, 1);
    EXPECT_EQ(readAll(*client),
              "event: values\ndata: ["
              R"({"node":"Line1","handle":5,"value":1,"time":"2026-03-07T09:00:00.000"},)"
              R"({"node":"Line1","handle":6,"value":"a\"b","time":"2026-03-07T09:00:00.000"},)"
              R"({"node":"Mem","handle":5,"value":2.5,"time":"2026-03-07T09:00:00.000"}])"
              "\n\n");
}

TEST_F(EventStreamTest, ErrorsGoAsTheyComeAndIdleClientsHearAKeepAlive) {
    auto client = stream_.connect();
    readAll(*client);
    runtime().reports().Errors.raise("Line1", "DF1", "ClsDriverNuvAbDf1.Poll", "no reply");
    EXPECT_EQ(readAll(*client),
              "event: error\ndata: "
              R"({"driver":"DF1","from":"ClsDriverNuvAbDf1.Poll","message":"no reply"})"
              "\n\n");
    advance(EventStream::KeepAlive);
    EXPECT_EQ(readAll(*client), ": keep-alive\n\n");
}

TEST_F(EventStreamTest, AClientThatDoesNotReadIsDroppedInsteadOfGrowing) {
    auto slow = stream_.connect();
    auto fast = stream_.connect();
    bool slowWoken = false;
    slow->ready = [&] { slowWoken = true; };
    std::vector<int32_t> handles(1000);
    std::vector<Variant> values(1000, Variant(std::string(100, 'x')));
    for (int32_t i = 0; i < 1000; ++i) handles[i] = i + 1;
    size_t fastBytes = 0;
    for (int turn = 0; turn < 20 && !slow->dropped(); ++turn) {
        report("Mem", handles, values);
        advance(std::chrono::milliseconds(0));
        fastBytes += readAll(*fast).size();
    }
    EXPECT_TRUE(slow->dropped());
    EXPECT_TRUE(slowWoken) << "its connection must learn that it ends";
    EXPECT_FALSE(fast->dropped());
    EXPECT_GT(fastBytes, EventStream::MaxBacklog);
    EXPECT_EQ(stream_.clients(), 1u);
    char byte;
    EXPECT_EQ(slow->read(&byte, 1), 0u);
}

TEST_F(EventStreamTest, NothingIsBuiltWhileNoClientListens) {
    report("Mem", {1}, {Variant(1)});
    auto client = stream_.connect();
    readAll(*client);
    advance(std::chrono::milliseconds(0));
    EXPECT_EQ(readAll(*client), "");
}

}  // namespace
}  // namespace maroset
