#include "lang/Event.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace maroset {
namespace {

TEST(Event, CallsHandlersInOrderWithReferenceArgumentsUntilUnsubscribed) {
    Event<int&> event;
    std::vector<int> seen;
    auto a = event.subscribe([&](int& v) { seen.push_back(v++); });
    auto b = event.subscribe([&](int& v) { seen.push_back(v); });
    int value = 1;
    event.raise(value);
    b.reset();
    event.raise(value);
    EXPECT_EQ(seen, (std::vector<int>{1, 2, 2}));
    EXPECT_EQ(event.handlerCount(), 1u);
}

TEST(Event, HandlersMayUnsubscribeOrSubscribeDuringRaise) {
    Event<> event;
    std::string trace;
    Subscription self, later;
    std::vector<Subscription> added;
    self = event.subscribe([&] {
        self.reset();                                                // itself: runs to the end
        later.reset();                                               // a later handler: not called
        added.push_back(event.subscribe([&] { trace += "new "; }));  // from the next raise
        trace += "first ";
    });
    later = event.subscribe([&] { trace += "later "; });
    event.raise();
    event.raise();
    EXPECT_EQ(trace, "first new ");
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
