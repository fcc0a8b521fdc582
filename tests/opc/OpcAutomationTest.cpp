#include "platform/opc/OPCServer.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/opc/OPCGroup.h"
#include "platform/opc/OpcErrors.h"
#include "platform/opc/OpcServerRegistry.h"
#include "platform/opc/SimulationServer.h"
#include "support/ErrorOf.h"
#include "support/RuntimeFixture.h"

namespace maroset::platform {
namespace {

using namespace std::chrono_literals;
using namespace opc;
using test::errorOf;
using Ints = std::vector<int32_t>;
using Values = std::vector<Variant>;

// What one group event delivered.
struct Delivery {
    int32_t transaction;
    Ints handles;
    Values values;
    Ints qualities;
    std::vector<DateTime> stamps;
    Ints errors;
};

// A connection to the simulated server with group "Line1", whose events are recorded.
class OpcSimulation : public test::RuntimeFixture {
  protected:
    OpcSimulation() {
        runtime().opcServers().Register("Maroset.Simulation", sim);
        server.Connect("Maroset.Simulation");
        group = server.OPCGroups().Add(Variant("Line1"));
        record(*group);
    }

    void record(OPCGroup& g) {
        // Every array of every event must start at 1.
        subs.push_back(
            g.DataChange.subscribe([this](int32_t id, int32_t, auto& h, auto& v, auto& q, auto& t) {
                changes.push_back({id, h.items(), v.items(), q.items(), t.items(), {}});
                EXPECT_EQ(h.LBound() + v.LBound() + q.LBound() + t.LBound(), 4);
            }));
        subs.push_back(g.AsyncReadComplete.subscribe(
            [this](int32_t id, int32_t, auto& h, auto& v, auto& q, auto& t, auto& e) {
                reads.push_back({id, h.items(), v.items(), q.items(), t.items(), e.items()});
                EXPECT_EQ(h.LBound() + v.LBound() + e.LBound(), 3);
            }));
        subs.push_back(
            g.AsyncWriteComplete.subscribe([this](int32_t id, int32_t, auto& h, auto& e) {
                writes.push_back({id, h.items(), {}, {}, {}, e.items()});
                EXPECT_EQ(h.LBound() + e.LBound(), 2);
            }));
    }

    // Adds items with client handles first, first + 1, ...; the server handles, the errors
    // in `errors`.
    Ints add(OPCGroup& g, const std::vector<std::string>& ids, int32_t first = 1) {
        Ints clients;
        for (size_t i = 0; i < ids.size(); ++i) clients.push_back(first + int32_t(i));
        VbArray<int32_t> handles, errs;
        g.OPCItems().AddItems(int32_t(ids.size()), VbArray<std::string>(1, ids),
                              VbArray<int32_t>(1, clients), handles, errs);
        EXPECT_EQ(handles.LBound() + errs.LBound(), 2);
        errors = errs.items();
        return handles.items();
    }
    void start(OPCGroup& g, int32_t rate) {
        g.UpdateRate(rate);
        g.IsSubscribed(true);
        g.IsActive(true);
    }
    Ints read(const Ints& handles, int32_t transaction = 7) {
        VbArray<int32_t> errs;
        int32_t cancel = 0;
        group->AsyncRead(int32_t(handles.size()), VbArray<int32_t>(1, handles), errs, transaction,
                         cancel);
        return errs.items();
    }
    Ints write(const Ints& handles, const Values& values, int32_t transaction = 9) {
        VbArray<int32_t> errs;
        int32_t cancel = 0;
        group->AsyncWrite(int32_t(handles.size()), VbArray<int32_t>(1, handles),
                          VbArray<Variant>(1, values), errs, transaction, cancel);
        return errs.items();
    }

    std::shared_ptr<SimulationServer> sim =
        std::make_shared<SimulationServer>(loop(), runtime().clock());
    OPCServer server{runtime().opcServers()};
    std::shared_ptr<OPCGroup> group;
    Ints errors;
    std::vector<Delivery> changes, reads, writes;
    std::vector<Subscription> subs;
};

TEST_F(OpcSimulation, ServersAreFoundByIdentifierAndAnUnknownOneIsNamed) {
    OPCServer other(runtime().opcServers());
    try {
        other.Connect("No.Such.Server");
        FAIL() << "connected to an unknown server";
    } catch (const VbError& e) {
        EXPECT_EQ(e.number(), CO_E_CLASSSTRING);
        EXPECT_NE(e.description().find("\"No.Such.Server\""), std::string::npos);
    }
    EXPECT_EQ(other.ServerState(), OPCServer::OPCDisconnected);
    EXPECT_EQ(errorOf([&] { other.Connect("Maroset.Simulation", "plc-host"); }), E_FAIL);

    other.Connect("maroset.SIMULATION", "localhost");  // any letter case
    EXPECT_EQ(other.ServerState(), OPCServer::OPCRunning);
    EXPECT_EQ(sim->Connections(), 2);
    EXPECT_EQ(errorOf([&] { other.Connect("Maroset.Simulation"); }), E_FAIL);
    EXPECT_EQ(other.GetOPCServers().items(), Values{Variant("Maroset.Simulation")});
    // Texts end in CR LF, as a server's message table gives them.
    EXPECT_EQ(other.GetErrorString(OPC_E_BADRIGHTS),
              "The item's access rights do not allow the operation.\r\n");
    EXPECT_EQ(errorOf([&] { other.GetErrorString(0x7777); }), E_INVALIDARG);
    other.Disconnect();
    EXPECT_EQ(sim->Connections(), 1);

    // Group names are unique per connection, letter case counting.
    EXPECT_EQ(errorOf([&] { server.OPCGroups().Add(Variant("Line1")); }), OPC_E_DUPLICATENAME);
    EXPECT_EQ(server.OPCGroups().Add(Variant("line1"))->Name(), "line1");
    EXPECT_EQ(server.OPCGroups().Add()->Name(), "Group1");
}

TEST_F(OpcSimulation, AddItemsResolvesItemByItemAndRefusesBadArgumentsWhole) {
    const auto h = add(*group, {"Static.A", "Ramp.B", "Bogus.C", "static.D", "", "Static."});
    EXPECT_EQ(errors,
              (Ints{0, 0, OPC_E_UNKNOWNITEMID, OPC_E_UNKNOWNITEMID, OPC_E_UNKNOWNITEMID, 0}));
    EXPECT_EQ((Ints{h[2], h[3], h[4]}), (Ints{0, 0, 0}));
    EXPECT_TRUE(h[0] > 0 && h[1] > 0 && h[5] > 0 && h[0] != h[1] && h[1] != h[5] && h[0] != h[5]);
    EXPECT_EQ(group->OPCItems().Count(), 3);

    VbArray<std::string> one(1, std::vector<std::string>{"Static.A"});
    VbArray<std::string> zeroBased(0, std::vector<std::string>{"Static.A"});
    VbArray<int32_t> clients(1, Ints{1}), sh, errs;
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(0, one, clients, sh, errs); }),
              E_INVALIDARG);
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(2, one, clients, sh, errs); }),
              err::SubscriptOutOfRange);
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(1, zeroBased, clients, sh, errs); }),
              err::SubscriptOutOfRange);
    EXPECT_EQ(group->OPCItems().Count(), 3);
}

TEST_F(OpcSimulation, DataChangeComesEveryPeriodWithOnlyTheChangedItems) {
    add(*group, {"Static.A", "Ramp.B", "Static.C"});
    const DateTime addedAt = runtime().clock().now();
    start(*group, 400);
    advance(399ms);
    EXPECT_TRUE(changes.empty());
    advance(1ms);  // the first one after activation holds every item
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_EQ(changes[0].transaction, 0);
    EXPECT_EQ(changes[0].handles, (Ints{1, 2, 3}));
    EXPECT_EQ(changes[0].values, (Values{int32_t{0}, int32_t{0}, int32_t{0}}));
    EXPECT_EQ(changes[0].qualities, (Ints{192, 192, 192}));
    EXPECT_EQ(changes[0].stamps, (std::vector<DateTime>{addedAt, addedAt, addedAt}));
    advance(400ms);  // nothing changed, nothing sent
    EXPECT_EQ(changes.size(), 1u);
    advance(400ms);  // 1200 ms: the ramp counted to 1 at 1000 ms
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[1].handles, Ints{2});
    EXPECT_EQ(changes[1].values, Values{int32_t{1}});
    EXPECT_EQ(changes[1].stamps, std::vector<DateTime>{addedAt + 1000ms});
    sim->SetStatic("Static.C", Variant("high"));
    sim->SetStatic("Static.A", Variant(int32_t{0}));  // the same value: no change
    advance(400ms);
    EXPECT_EQ(changes.back().handles, Ints{3});
    sim->SetStatic("Static.A", Variant(int16_t{0}));  // another type is another value
    add(*group, {"Static.D"}, 4);                     // new items come in the next one
    advance(400ms);
    EXPECT_EQ(changes.back().handles, (Ints{1, 2, 4}));

    group->IsActive(false);
    advance(3000ms);
    EXPECT_EQ(changes.size(), 4u);
    group->IsActive(true);  // every item again
    advance(400ms);
    EXPECT_EQ(changes.back().handles, (Ints{1, 2, 3, 4}));
    group->IsSubscribed(false);
    advance(3000ms);
    EXPECT_EQ(changes.size(), 5u);

    EXPECT_EQ(errorOf([&] { group->UpdateRate(-1); }), E_INVALIDARG);
    group->UpdateRate(0);  // revised to the fastest rate
    EXPECT_EQ(group->UpdateRate(), OPCGroup::FastestUpdateRate);
}

TEST_F(OpcSimulation, EachRampCountsWholeSecondsFromItsOwnAdd) {
    add(*group, {"Ramp.A"});
    advance(600ms);
    add(*group, {"Ramp.A"}, 2);
    start(*group, 100);
    advance(400ms);  // 1000 and 400 ms old
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[0].values, (Values{int32_t{0}, int32_t{0}}));
    EXPECT_EQ(changes[1].handles, Ints{1});
    advance(600ms);
    EXPECT_EQ(changes.back().handles, Ints{2});
    EXPECT_EQ(changes.back().values, Values{int32_t{1}});
}

TEST_F(OpcSimulation, AsyncReadAnswersOnTheNextTurnEvenWhenInactive) {
    const auto h = add(*group, {"Static.A", "Ramp.B"});
    group->IsActive(false);
    advance(2500ms);
    EXPECT_EQ(read({h[1], 999, h[0]}, 42), (Ints{0, OPC_E_INVALIDHANDLE, 0}));
    EXPECT_TRUE(reads.empty());  // never from inside the call
    advance(0ms);
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].transaction, 42);
    EXPECT_EQ(reads[0].handles, (Ints{2, 1}));
    EXPECT_EQ(reads[0].values, (Values{int32_t{2}, int32_t{0}}));
    EXPECT_EQ(reads[0].errors, (Ints{0, 0}));
    EXPECT_EQ(read({0}), Ints{OPC_E_INVALIDHANDLE});
    advance(0ms);
    EXPECT_EQ(reads.size(), 1u);  // nothing accepted, nothing answered
    EXPECT_EQ(errorOf([&] { read({}); }), E_INVALIDARG);
}

TEST_F(OpcSimulation, AsyncWriteChangesStaticsForEveryClientAndRefusesRamps) {
    const auto h = add(*group, {"Static.A", "Ramp.B"});
    EXPECT_EQ(write({h[0], h[1], 77}, {Variant(12.5), Variant(3), Variant(1)}, 5),
              (Ints{0, OPC_E_BADRIGHTS, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(int32_t{0}));  // not before the answer
    advance(0ms);
    ASSERT_EQ(writes.size(), 1u);
    EXPECT_EQ(writes[0].transaction, 5);
    EXPECT_EQ(writes[0].handles, Ints{1});
    EXPECT_EQ(writes[0].errors, Ints{0});
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(12.5));

    OPCServer other(runtime().opcServers());  // another client sees the same value
    other.Connect("Maroset.Simulation");
    auto g2 = other.OPCGroups().Add(Variant("Other"));
    record(*g2);
    add(*g2, {"Static.A"}, 20);
    start(*g2, 100);
    advance(100ms);
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_EQ(changes[0].values, Values{Variant(12.5)});

    const Variant block(VbArray<Variant>(0, Values{Variant(1), Variant("two")}));
    EXPECT_EQ(write({h[0]}, {block}), Ints{0});
    EXPECT_EQ(write({h[0]}, {Variant(std::make_shared<Object>())}), Ints{OPC_E_BADTYPE});
    advance(0ms);
    EXPECT_EQ(sim->StaticValue("Static.A"), block);
    EXPECT_EQ(writes.size(), 2u);  // refused writes are not answered
}

TEST_F(OpcSimulation, RemovedItemsAndGroupsFallSilent) {
    auto h = add(*group, {"Static.A", "Ramp.B", "Static.C"});
    VbArray<int32_t> errs;
    group->OPCItems().Remove(2, VbArray<int32_t>(1, Ints{h[0], 4242}), errs);
    EXPECT_EQ(errs.items(), (Ints{0, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(group->OPCItems().Count(), 2);
    // A read asked for before a removal answers the removed item with an error.
    EXPECT_EQ(read({h[1], h[2]}), (Ints{0, 0}));
    group->OPCItems().Remove(1, VbArray<int32_t>(1, Ints{h[2]}), errs);
    advance(0ms);
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].errors, (Ints{0, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(reads[0].qualities[1], OPC_QUALITY_BAD);
    const auto d = add(*group, {"Static.D"}, 9);
    start(*group, 100);
    advance(100ms);
    EXPECT_EQ(changes.back().handles, (Ints{2, 9}));  // in the order added

    // A removed group: no more events, not even answers already asked for; calls fail.
    read({h[1]});
    write({d[0]}, {Variant(5)});
    server.OPCGroups().RemoveAll();
    advance(1000ms);
    EXPECT_EQ(changes.size() + reads.size() + writes.size(), 2u);
    EXPECT_EQ(sim->StaticValue("Static.D"), Variant(int32_t{0}));
    EXPECT_EQ(errorOf([&] { read({h[1]}); }), E_FAIL);
    EXPECT_EQ(errorOf([&] { group->IsActive(true); }), E_FAIL);
    auto g = server.OPCGroups().Add(Variant("Line1"));  // the name is free again
    server.Disconnect();
    EXPECT_FALSE(g->live());
    EXPECT_EQ(sim->Connections(), 0);
}

}  // namespace
}  // namespace maroset::platform
