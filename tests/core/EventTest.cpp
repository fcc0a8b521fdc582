#include "core/Event.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace maroset {
namespace {

TEST(Event, CallsHandlersInSubscriptionOrderWithReferenceArguments) {
    Event<int&> event;
    std::vector<int> seen;
    auto a = event.subscribe([&](int& v) { seen.push_back(v++); });
    auto b = event.subscribe([&](int& v) { seen.push_back(v); });
    int value = 1;
    event.raise(value);
    EXPECT_EQ(seen, (std::vector<int>{1, 2}));
    EXPECT_EQ(value, 2);
}

TEST(Event, DestroyedSubscriptionUnsubscribes) {
    Event<> event;
    int calls = 0;
    {
        auto sub = event.subscribe([&] { ++calls; });
        event.raise();
    }
    event.raise();
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(event.handlerCount(), 0u);
}

TEST(Event, HandlerUnsubscribingALaterHandlerDuringRaiseStopsIt) {
    Event<> event;
    std::vector<std::string> seen;
    Subscription second;
    auto first = event.subscribe([&] {
        seen.push_back("first");
        second.reset();
    });
    second = event.subscribe([&] { seen.push_back("second"); });
    event.raise();
    event.raise();
    EXPECT_EQ(seen, (std::vector<std::string>{"first", "first"}));
}

TEST(Event, HandlerUnsubscribingItselfRunsToTheEnd) {
    Event<> event;
    Subscription self;
    std::string trace;
    self = event.subscribe([&] {
        self.reset();
        trace += "still here";
    });
    event.raise();
    event.raise();
    EXPECT_EQ(trace, "still here");
}

TEST(Event, HandlerSubscribedDuringRaiseRunsFromTheNextRaise) {
    Event<> event;
    int late = 0;
    std::vector<Subscription> subs;
    subs.push_back(event.subscribe([&] {
        if (subs.size() < 3) subs.push_back(event.subscribe([&] { ++late; }));
    }));
    event.raise();
    EXPECT_EQ(late, 0);
    event.raise();
    EXPECT_EQ(late, 1);
}

TEST(Event, HandlerMayDestroyTheSource) {
    auto owner = std::make_unique<Event<>>();
    int after = 0;
    Subscription kill = owner->subscribe([&] { owner.reset(); });
    Subscription next = owner->subscribe([&] { ++after; });
    owner->raise();
    EXPECT_FALSE(owner);
    EXPECT_EQ(after, 1);  // the raise finishes with the handlers it had
    kill.reset();         // unsubscribing after the source is gone is harmless
}

TEST(Event, NestedRaiseAndRemovalKeepsEveryHandlerOnce) {
    Event<int> event;
    std::vector<int> seen;
    Subscription b;
    auto a = event.subscribe([&](int depth) {
        if (depth == 0) {
            event.raise(1);
            b.reset();
        }
        seen.push_back(depth);
    });
    b = event.subscribe([&](int depth) { seen.push_back(10 + depth); });
    event.raise(0);
    EXPECT_EQ(seen, (std::vector<int>{1, 11, 0}));
    EXPECT_EQ(event.handlerCount(), 1u);
}

}  // namespace
}  // namespace maroset
