#include "platform/opc/OPCServer.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/opc/OPCGroup.h"
#include "platform/opc/OPCGroups.h"
#include "platform/opc/OPCItems.h"
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

VbArray<int32_t> oneBased(std::vector<int32_t> items) {
    return VbArray<int32_t>(1, std::move(items));
}

// What one group event delivered.
struct Delivery {
    int32_t transaction;
    std::vector<int32_t> handles;
    std::vector<Variant> values;
    std::vector<int32_t> qualities;
    std::vector<DateTime> stamps;
    std::vector<int32_t> errors;
    bool oneBased;
};

// A connection to the simulated server with one group whose events are recorded.
class OpcSimulation : public test::RuntimeFixture {
  protected:
    OpcSimulation() {
        sim = std::make_shared<SimulationServer>(loop(), runtime().clock());
        runtime().opcServers().Register("Maroset.Simulation", sim);
        server.Connect("Maroset.Simulation");
        group = server.OPCGroups().Add(Variant("Line1"));
        record(*group);
    }

    void record(OPCGroup& g) {
        subs.push_back(g.DataChange.subscribe([this](int32_t id, int32_t n, VbArray<int32_t>& h,
                                                     VbArray<Variant>& v, VbArray<int32_t>& q,
                                                     VbArray<DateTime>& t) {
            EXPECT_EQ(n, h.size());
            changes.push_back(
                {id,
                 h.items(),
                 v.items(),
                 q.items(),
                 t.items(),
                 {},
                 h.LBound() == 1 && v.LBound() == 1 && q.LBound() == 1 && t.LBound() == 1});
        }));
        subs.push_back(g.AsyncReadComplete.subscribe(
            [this](int32_t id, int32_t n, VbArray<int32_t>& h, VbArray<Variant>& v,
                   VbArray<int32_t>& q, VbArray<DateTime>& t, VbArray<int32_t>& e) {
                EXPECT_EQ(n, h.size());
                reads.push_back({id, h.items(), v.items(), q.items(), t.items(), e.items(),
                                 h.LBound() == 1 && e.LBound() == 1});
            }));
        subs.push_back(g.AsyncWriteComplete.subscribe(
            [this](int32_t id, int32_t n, VbArray<int32_t>& h, VbArray<int32_t>& e) {
                EXPECT_EQ(n, h.size());
                writes.push_back({id, h.items(), {}, {}, {}, e.items(), h.LBound() == 1});
            }));
    }

    // Adds items with client handles 1, 2, ...; returns the server handles, errors in `errors`.
    std::vector<int32_t> add(OPCGroup& g, const std::vector<std::string>& ids,
                             int32_t firstHandle = 1) {
        std::vector<int32_t> clients;
        for (size_t i = 0; i < ids.size(); ++i) clients.push_back(firstHandle + int32_t(i));
        VbArray<std::string> itemIDs(1, ids);
        VbArray<int32_t> clientHandles(1, clients);
        VbArray<int32_t> serverHandles;
        VbArray<int32_t> errs;
        g.OPCItems().AddItems(int32_t(ids.size()), itemIDs, clientHandles, serverHandles, errs);
        EXPECT_EQ(serverHandles.LBound(), 1);
        EXPECT_EQ(errs.LBound(), 1);
        errors = errs.items();
        return serverHandles.items();
    }

    void start(OPCGroup& g, int32_t rate = 500) {
        g.UpdateRate(rate);
        g.IsSubscribed(true);
        g.IsActive(true);
    }

    std::vector<int32_t> read(const std::vector<int32_t>& handles, int32_t transaction = 7) {
        VbArray<int32_t> errs;
        int32_t cancel = 0;
        group->AsyncRead(int32_t(handles.size()), VbArray<int32_t>(1, handles), errs, transaction,
                         cancel);
        return errs.items();
    }
    std::vector<int32_t> write(const std::vector<int32_t>& handles, const std::vector<Variant>& v,
                               int32_t transaction = 9) {
        VbArray<int32_t> errs;
        int32_t cancel = 0;
        group->AsyncWrite(int32_t(handles.size()), VbArray<int32_t>(1, handles),
                          VbArray<Variant>(1, v), errs, transaction, cancel);
        return errs.items();
    }

    DateTime wallClock() { return runtime().clock().now(); }

    std::shared_ptr<SimulationServer> sim;
    OPCServer server{runtime().opcServers()};
    std::shared_ptr<OPCGroup> group;
    std::vector<int32_t> errors;
    std::vector<Delivery> changes, reads, writes;
    std::vector<Subscription> subs;
};

TEST(OpcErrorTexts, StandardCodesHaveTheStandardsWordingAndTheMessageTableLineEnd) {
    EXPECT_EQ(StandardErrorText(OPC_E_INVALIDHANDLE), "The value of the handle is invalid.\r\n");
    EXPECT_EQ(StandardErrorText(OPC_E_BADRIGHTS),
              "The item's access rights do not allow the operation.\r\n");
    EXPECT_EQ(StandardErrorText(OPC_E_UNKNOWNITEMID),
              "The item ID is not defined in the server address space or no longer exists in "
              "the server address space.\r\n");
    EXPECT_EQ(StandardErrorText(OPC_E_INVALIDITEMID),
              "The item ID does not conform to the server's syntax.\r\n");
    EXPECT_EQ(StandardErrorText(0), "The operation completed successfully.\r\n");
    EXPECT_EQ(StandardErrorText(0x12345), std::nullopt);
    EXPECT_EQ(OPC_E_INVALIDHANDLE, -1073479679);
    EXPECT_EQ(OPC_E_UNKNOWNITEMID, -1073479673);
    EXPECT_EQ(HexCode(OPC_E_BADRIGHTS), "0xC0040006");
}

TEST_F(OpcSimulation, ConnectFindsServersByIdentifierAndNamesAnUnknownOne) {
    OPCServer other(runtime().opcServers());
    try {
        other.Connect("No.Such.Server");
        FAIL() << "connected to an unknown server";
    } catch (const VbError& e) {
        EXPECT_EQ(e.number(), CO_E_CLASSSTRING);
        EXPECT_NE(e.description().find("\"No.Such.Server\""), std::string::npos) << e.description();
    }
    EXPECT_EQ(other.ServerState(), OPCServer::OPCDisconnected);
    EXPECT_NE(errorOf([&] { other.OPCGroups().Add(Variant("G")); }), 0);
    EXPECT_NE(errorOf([&] { other.GetErrorString(0); }), 0);

    EXPECT_EQ(errorOf([&] { other.Connect("Maroset.Simulation", "plc-host"); }), E_FAIL);
    other.Connect("maroset.SIMULATION", "localhost");  // identifiers match in any letter case
    EXPECT_EQ(other.ServerState(), OPCServer::OPCRunning);
    EXPECT_EQ(other.ServerName(), "maroset.SIMULATION");
    EXPECT_EQ(sim->Connections(), 2);
    EXPECT_EQ(errorOf([&] { other.Connect("Maroset.Simulation"); }), E_FAIL);
    const VbArray<Variant> list = other.GetOPCServers();
    EXPECT_EQ(list.LBound(), 1);
    EXPECT_EQ(list.items(), std::vector<Variant>{Variant("Maroset.Simulation")});
    other.Disconnect();
    other.Disconnect();  // once connected or not, nothing more happens
    EXPECT_EQ(sim->Connections(), 1);
}

TEST_F(OpcSimulation, ErrorStringsComeWithCrLfAndUnknownCodesFail) {
    EXPECT_EQ(server.GetErrorString(OPC_E_BADRIGHTS),
              "The item's access rights do not allow the operation.\r\n");
    EXPECT_EQ(errorOf([&] { server.GetErrorString(0x7777); }), E_INVALIDARG);
}

TEST_F(OpcSimulation, GroupNamesAreUniquePerConnection) {
    EXPECT_EQ(group->Name(), "Line1");
    EXPECT_EQ(errorOf([&] { server.OPCGroups().Add(Variant("Line1")); }), OPC_E_DUPLICATENAME);
    EXPECT_EQ(server.OPCGroups().Add(Variant("line1"))->Name(), "line1");
    EXPECT_EQ(server.OPCGroups().Add()->Name(), "Group1");
    EXPECT_EQ(server.OPCGroups().Count(), 3);
    // Defaults of a new group: active, 1000 ms, not subscribed.
    EXPECT_TRUE(group->IsActive());
    EXPECT_FALSE(group->IsSubscribed());
    EXPECT_EQ(group->UpdateRate(), 1000);
}

TEST_F(OpcSimulation, AddItemsResolvesTheAddressSpaceItemByItem) {
    const auto handles =
        add(*group, {"Static.A", "Ramp.B", "Bogus.C", "static.D", "", "Static.", "Ramp.B"});
    EXPECT_EQ(errors, (std::vector<int32_t>{0, 0, OPC_E_UNKNOWNITEMID, OPC_E_UNKNOWNITEMID,
                                            OPC_E_UNKNOWNITEMID, 0, 0}));
    ASSERT_EQ(handles.size(), 7u);
    EXPECT_EQ(handles[2], 0);
    EXPECT_EQ(handles[3], 0);
    EXPECT_EQ(handles[4], 0);
    const std::vector<int32_t> good{handles[0], handles[1], handles[5], handles[6]};
    for (size_t i = 0; i < good.size(); ++i) {
        EXPECT_GT(good[i], 0);
        for (size_t j = 0; j < i; ++j) EXPECT_NE(good[i], good[j]);
    }
    EXPECT_EQ(group->OPCItems().Count(), 4);
}

TEST_F(OpcSimulation, AddItemsRefusesBadArgumentsBeforeAddingAnything) {
    VbArray<std::string> ids(1, std::vector<std::string>{"Static.A"});
    VbArray<int32_t> clients(1, std::vector<int32_t>{1});
    VbArray<int32_t> sh, errs;
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(0, ids, clients, sh, errs); }),
              E_INVALIDARG);
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(2, ids, clients, sh, errs); }),
              err::SubscriptOutOfRange);
    VbArray<std::string> zeroBased(0, std::vector<std::string>{"Static.A"});
    EXPECT_EQ(errorOf([&] { group->OPCItems().AddItems(1, zeroBased, clients, sh, errs); }),
              err::SubscriptOutOfRange);
    EXPECT_EQ(group->OPCItems().Count(), 0);
}

TEST_F(OpcSimulation, DataChangeComesEveryPeriodWithOnlyChangedItems) {
    const auto h = add(*group, {"Static.A", "Ramp.B", "Static.C"});
    const DateTime addedAt = wallClock();
    start(*group, 400);
    advance(399ms);
    EXPECT_TRUE(changes.empty());
    advance(1ms);  // the first one after activation holds every item
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_TRUE(changes[0].oneBased);
    EXPECT_EQ(changes[0].transaction, 0);
    EXPECT_EQ(changes[0].handles, (std::vector<int32_t>{1, 2, 3}));
    EXPECT_EQ(changes[0].values, (std::vector<Variant>{int32_t{0}, int32_t{0}, int32_t{0}}));
    EXPECT_EQ(changes[0].qualities, (std::vector<int32_t>{192, 192, 192}));
    EXPECT_EQ(changes[0].stamps, (std::vector<DateTime>{addedAt, addedAt, addedAt}));

    advance(400ms);  // 800 ms: nothing changed, nothing sent
    EXPECT_EQ(changes.size(), 1u);
    advance(400ms);  // 1200 ms: the ramp has counted to 1
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[1].handles, std::vector<int32_t>{2});
    EXPECT_EQ(changes[1].values, std::vector<Variant>{int32_t{1}});
    EXPECT_EQ(changes[1].stamps, std::vector<DateTime>{addedAt + 1000ms});

    sim->SetStatic("Static.C", Variant("high"));
    sim->SetStatic("Static.A", Variant(int32_t{0}));  // the same value again: no change
    advance(400ms);
    ASSERT_EQ(changes.size(), 3u);
    EXPECT_EQ(changes[2].handles, std::vector<int32_t>{3});
    EXPECT_EQ(changes[2].values, std::vector<Variant>{Variant("high")});

    sim->SetStatic("Static.A", Variant(int16_t{0}));  // another type is another value
    advance(400ms);
    ASSERT_EQ(changes.size(), 4u);
    EXPECT_EQ(changes[3].handles, (std::vector<int32_t>{1, 2}));
    (void)h;
}

TEST_F(OpcSimulation, NothingComesWhileInactiveOrUnsubscribedAndReactivationSendsAll) {
    add(*group, {"Static.A", "Ramp.B"});
    start(*group, 100);
    advance(100ms);
    ASSERT_EQ(changes.size(), 1u);
    group->IsActive(false);
    advance(3000ms);
    EXPECT_EQ(changes.size(), 1u);
    group->IsActive(true);
    advance(100ms);
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[1].handles, (std::vector<int32_t>{1, 2}));
    EXPECT_EQ(changes[1].values[1], Variant(int32_t{3}));

    group->IsSubscribed(false);
    advance(2000ms);
    EXPECT_EQ(changes.size(), 2u);
    group->IsSubscribed(true);  // the ramp moved on meanwhile; the static did not
    advance(100ms);
    ASSERT_EQ(changes.size(), 3u);
    EXPECT_EQ(changes[2].handles, std::vector<int32_t>{2});
}

TEST_F(OpcSimulation, ItemsAddedToAnActiveGroupAreReportedAtTheNextUpdate) {
    add(*group, {"Static.A"});
    start(*group, 100);
    advance(100ms);
    add(*group, {"Static.B", "Ramp.C"}, 5);
    advance(100ms);
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[1].handles, (std::vector<int32_t>{5, 6}));
}

TEST_F(OpcSimulation, UpdateRateIsRevisedToTheFastestAndNegativeRatesAreRefused) {
    add(*group, {"Ramp.A"});
    start(*group, 0);
    EXPECT_EQ(group->UpdateRate(), OPCGroup::FastestUpdateRate);
    advance(10ms);
    EXPECT_EQ(changes.size(), 1u);
    EXPECT_EQ(errorOf([&] { group->UpdateRate(-1); }), E_INVALIDARG);
    EXPECT_EQ(group->UpdateRate(), OPCGroup::FastestUpdateRate);
}

TEST_F(OpcSimulation, EachRampCountsWholeSecondsFromItsOwnAdd) {
    add(*group, {"Ramp.A"});
    advance(600ms);
    add(*group, {"Ramp.A"}, 2);  // the same ID added again starts from 0 again
    start(*group, 100);
    advance(300ms);  // 900 ms and 300 ms old
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_EQ(changes[0].values, (std::vector<Variant>{int32_t{0}, int32_t{0}}));
    advance(100ms);  // 1000 ms: the first has counted to 1
    ASSERT_EQ(changes.size(), 2u);
    EXPECT_EQ(changes[1].handles, std::vector<int32_t>{1});
    advance(600ms);  // 1600 and 1000 ms
    ASSERT_EQ(changes.size(), 3u);
    EXPECT_EQ(changes[2].handles, std::vector<int32_t>{2});
    EXPECT_EQ(changes[2].values, std::vector<Variant>{int32_t{1}});
}

TEST_F(OpcSimulation, AsyncReadAnswersOnTheNextTurnWithTheAcceptedItemsEvenWhenInactive) {
    const auto h = add(*group, {"Static.A", "Ramp.B"});
    group->IsActive(false);
    advance(2500ms);
    EXPECT_EQ(read({h[1], 999, h[0]}, 42), (std::vector<int32_t>{0, OPC_E_INVALIDHANDLE, 0}));
    EXPECT_TRUE(reads.empty());  // never from inside the call
    advance(0ms);
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_TRUE(reads[0].oneBased);
    EXPECT_EQ(reads[0].transaction, 42);
    EXPECT_EQ(reads[0].handles, (std::vector<int32_t>{2, 1}));
    EXPECT_EQ(reads[0].values, (std::vector<Variant>{int32_t{2}, int32_t{0}}));
    EXPECT_EQ(reads[0].qualities, (std::vector<int32_t>{192, 192}));
    EXPECT_EQ(reads[0].errors, (std::vector<int32_t>{0, 0}));

    EXPECT_EQ(read({0}), std::vector<int32_t>{OPC_E_INVALIDHANDLE});
    advance(0ms);
    EXPECT_EQ(reads.size(), 1u);  // nothing accepted, nothing answered
    EXPECT_EQ(errorOf([&] { read({}); }), E_INVALIDARG);
}

TEST_F(OpcSimulation, AsyncWriteChangesStaticsForEveryClientAndRefusesRamps) {
    const auto h = add(*group, {"Static.A", "Ramp.B"});
    VbArray<Variant> block(0, std::vector<Variant>{Variant(1), Variant("two")});
    EXPECT_EQ(write({h[0], h[1], 77}, {Variant(12.5), Variant(3), Variant(1)}, 5),
              (std::vector<int32_t>{0, OPC_E_BADRIGHTS, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(int32_t{0}));  // not before the answer
    advance(0ms);
    ASSERT_EQ(writes.size(), 1u);
    EXPECT_EQ(writes[0].transaction, 5);
    EXPECT_EQ(writes[0].handles, std::vector<int32_t>{1});
    EXPECT_EQ(writes[0].errors, std::vector<int32_t>{0});
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(12.5));

    // Another connection sees the same Static item.
    OPCServer other(runtime().opcServers());
    other.Connect("Maroset.Simulation");
    auto g2 = other.OPCGroups().Add(Variant("Other"));
    record(*g2);
    add(*g2, {"Static.A"}, 20);
    start(*g2, 100);
    advance(100ms);
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_EQ(changes[0].values, std::vector<Variant>{Variant(12.5)});

    EXPECT_EQ(write({h[0]}, {Variant(block)}), std::vector<int32_t>{0});  // arrays too
    advance(0ms);
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(block));
    EXPECT_EQ(write({h[0]}, {Variant(std::make_shared<Object>())}),
              std::vector<int32_t>{OPC_E_BADTYPE});
    EXPECT_EQ(write({h[1]}, {Variant(1)}), std::vector<int32_t>{OPC_E_BADRIGHTS});
    advance(0ms);
    EXPECT_EQ(writes.size(), 2u);  // refused writes are not answered
}

TEST_F(OpcSimulation, RemovedItemsLeaveReportsAndTheirHandlesBecomeInvalid) {
    auto h = add(*group, {"Static.A", "Ramp.B", "Static.C"});
    VbArray<int32_t> errs;
    group->OPCItems().Remove(2, oneBased({h[0], 4242}), errs);
    EXPECT_EQ(errs.LBound(), 1);
    EXPECT_EQ(errs.items(), (std::vector<int32_t>{0, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(group->OPCItems().Count(), 2);
    group->OPCItems().Remove(1, oneBased({h[0]}), errs);
    EXPECT_EQ(errs.items(), std::vector<int32_t>{OPC_E_INVALIDHANDLE});
    // A read asked for before the removal answers the removed item with an error.
    EXPECT_EQ(read({h[1], h[2]}), (std::vector<int32_t>{0, 0}));
    group->OPCItems().Remove(1, oneBased({h[2]}), errs);
    advance(0ms);
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].handles, (std::vector<int32_t>{2, 3}));
    EXPECT_EQ(reads[0].errors, (std::vector<int32_t>{0, OPC_E_INVALIDHANDLE}));
    EXPECT_EQ(reads[0].qualities[1], OPC_QUALITY_BAD);
    start(*group, 100);
    advance(100ms);
    ASSERT_EQ(changes.size(), 1u);
    EXPECT_EQ(changes[0].handles, std::vector<int32_t>{2});
    // Items added after removals keep the add order and new handles.
    const auto later = add(*group, {"Static.D"}, 9);
    EXPECT_GT(later[0], h[2]);
    group->IsActive(false);
    group->IsActive(true);
    advance(100ms);
    EXPECT_EQ(changes.back().handles, (std::vector<int32_t>{2, 9}));
}

TEST_F(OpcSimulation, RemovedGroupsFallSilentAndRefuseCalls) {
    const auto h = add(*group, {"Static.A"});
    start(*group, 100);
    read({h[0]});
    write({h[0]}, {Variant(5)});
    server.OPCGroups().RemoveAll();
    EXPECT_EQ(server.OPCGroups().Count(), 0);
    advance(1000ms);
    EXPECT_TRUE(changes.empty() && reads.empty() && writes.empty());
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(int32_t{0}));  // the write died with it
    EXPECT_FALSE(group->live());
    EXPECT_EQ(errorOf([&] { read({h[0]}); }), E_FAIL);
    EXPECT_EQ(errorOf([&] { group->IsActive(true); }), E_FAIL);
    EXPECT_EQ(errorOf([&] { add(*group, {"Static.B"}); }), E_FAIL);

    auto g = server.OPCGroups().Add(Variant("Line1"));  // the name is free again
    server.Disconnect();
    EXPECT_FALSE(g->live());
    EXPECT_EQ(sim->Connections(), 0);
}

TEST_F(OpcSimulation, AHandlerMayReleaseTheGroupAndTheServer) {
    auto other = std::make_unique<OPCServer>(runtime().opcServers());
    other->Connect("Maroset.Simulation");
    auto g = other->OPCGroups().Add(Variant("G"));
    add(*g, {"Static.A", "Ramp.B"});
    int calls = 0;
    auto sub = g->DataChange.subscribe([&](int32_t, int32_t, VbArray<int32_t>&, VbArray<Variant>&,
                                           VbArray<int32_t>&, VbArray<DateTime>&) {
        ++calls;
        g.reset();
        other.reset();
    });
    start(*g, 100);
    advance(5000ms);
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(sim->Connections(), 1);
}

}  // namespace
}  // namespace maroset::platform
