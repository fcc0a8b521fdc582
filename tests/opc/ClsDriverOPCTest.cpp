#include "drivers/opc/ClsDriverOPC.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "core/node.h"
#include "lang/Conversions.h"
#include "platform/opc/OPCGroup.h"
#include "platform/opc/OPCServer.h"
#include "platform/opc/OpcErrors.h"
#include "platform/opc/OpcServerRegistry.h"
#include "platform/opc/SimulationServer.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using namespace platform::opc;
using test::errorOf;

const std::string kUnknownItem =
    "The item ID is not defined in the server address space or no longer exists in the server "
    "address space.";
const std::string kInvalidHandle = "The value of the handle is invalid.";

// A server that accepts what the simulated one accepts, remembers every item ID it was asked
// for, and has texts of its own for two vendor codes.
class RecordingServer final : public platform::OpcServerBackend {
  public:
    static constexpr int32_t SplitText = Code(0x80040999);
    static constexpr int32_t BareText = Code(0x80040998);

    explicit RecordingServer(std::shared_ptr<platform::SimulationServer> sim)
        : sim_(std::move(sim)) {}
    int32_t AddItem(const std::string& id,
                    std::shared_ptr<platform::OpcItemSource>& item) override {
        asked.push_back(id);
        return sim_->AddItem(id, item);
    }
    std::optional<std::string> ErrorText(int32_t code) const override {
        if (code == SplitText) return std::string("Vendor\r\ntext");
        if (code == BareText) return std::string("No line end");
        return std::nullopt;
    }
    std::string VendorInfo() const override { return "recorder"; }

    std::vector<std::string> asked;

  private:
    std::shared_ptr<platform::SimulationServer> sim_;
};

// OPC nodes on the simulated server (or the recording one), on the virtual clock.
class OpcDriver : public test::RuntimeFixture {
  protected:
    OpcDriver() {
        sim = std::make_shared<platform::SimulationServer>(loop(), runtime().clock());
        recorder = std::make_shared<RecordingServer>(sim);
        runtime().opcServers().Register("Maroset.Simulation", sim);
        runtime().opcServers().Register("Test.Recorder", recorder);
        runtime().trace().setSink([this](std::string_view l) { traced.emplace_back(l); });
    }

    std::shared_ptr<node> makeNode(const Variant& server = Variant("Maroset.Simulation"),
                                   const Variant& prefix = Variant::Null(),
                                   const Variant& rate = Variant(500),
                                   const std::string& name = "Opc") {
        auto n = std::make_shared<node>();
        n->Name = name;
        n->DriverName = Variant("opc");
        n->ServerName = server;
        n->ScanRate = rate;
        n->TagPrefex = prefix;
        n->Init();
        return n;
    }
    static ClsDriverOPC& opc(const node& n) { return dynamic_cast<ClsDriverOPC&>(*n.driver()); }

    // The values of every ValueChange so far, flattened as "handle=value".
    std::vector<std::string> reported() const {
        std::vector<std::string> out;
        for (const auto& c : host.changes)
            for (size_t i = 0; i < c.handles.size(); ++i)
                out.push_back(std::to_string(c.handles[i]) + "=" + CStr(c.values[i]));
        return out;
    }
    size_t logCount(const std::string& text) const {
        const std::string log = readDriveFile("MarosetErrors.txt");
        size_t n = 0;
        for (size_t at = log.find(text); at != std::string::npos; at = log.find(text, at + 1)) ++n;
        return n;
    }
    bool wasTraced(const std::string& line) const {
        return std::find(traced.begin(), traced.end(), line) != traced.end();
    }

    std::shared_ptr<platform::SimulationServer> sim;
    std::shared_ptr<RecordingServer> recorder;
    test::HostRecorder host;
    std::vector<std::string> traced;
};

using Reported = std::vector<std::string>;

TEST_F(OpcDriver, StartupConnectsAndMakesTheNodesGroupSubscribedButInactive) {
    auto n = makeNode(Variant("Maroset.Simulation"), Variant::Null(), Variant("250"));
    ClsDriverOPC& d = opc(*n);
    EXPECT_STREQ(d.className(), "ClsDriverOPC");
    EXPECT_TRUE(d.Connected());
    ASSERT_TRUE(d.group());
    EXPECT_EQ(d.group()->Name(), "Opc");
    EXPECT_TRUE(d.group()->IsSubscribed());
    EXPECT_FALSE(d.group()->IsActive());
    EXPECT_EQ(d.group()->UpdateRate(), 250);
    EXPECT_EQ(d.NodeName(), "Opc");
    EXPECT_EQ(sim->Connections(), 1);
    EXPECT_EQ(errorLogRecords(), 0u);
    // Two nodes on one server have a connection each.
    auto other = makeNode(Variant("Maroset.Simulation"), Variant::Null(), Variant(100), "Opc2");
    EXPECT_EQ(sim->Connections(), 2);
}

TEST_F(OpcDriver, UnknownServerIsLoggedNotRaisedAndLeavesTheDriverConnectedButDead) {
    std::shared_ptr<node> n;
    ASSERT_EQ(errorOf([&] { n = makeNode(Variant("No.Such")); }), 0);
    // Connect retried until the burst passes 5, then one record per later statement.
    EXPECT_EQ(errorLogRecords(), 10u);
    EXPECT_EQ(logCount("Module\\Sub: ClsDriverOPC.ConnectServer 0"), 10u);
    EXPECT_EQ(logCount("\"No.Such\""), 6u);
    ClsDriverOPC& d = opc(*n);
    EXPECT_TRUE(d.Connected());
    EXPECT_FALSE(d.group());
    EXPECT_NO_THROW(n->AddTag(1, "Static.A"));  // always trapped
    EXPECT_TRUE(host.errors.empty() && host.changes.empty());
    // IsActive follows the switch: off, so the failure reaches the host.
    EXPECT_EQ(errorOf([&] { n->IsActive(true); }), err::ObjectNotSet);
    EXPECT_EQ(sim->Connections(), 0);
}

TEST_F(OpcDriver, ItemIdsAreThePrefixJoinedToTheTagName) {
    const std::vector<std::pair<Variant, std::string>> cases{
        {Variant("[Topic1]"), "[Topic1]N7:0"},
        {Variant(""), "N7:0"},
        {Variant::Null(), "N7:0"},
        {Variant(), "N7:0"},
        {Variant(int32_t{0}), "0N7:0"},  // a number joins as its text
    };
    int16_t handle = 1;
    for (const auto& [prefix, id] : cases) {
        auto n = makeNode(Variant("Test.Recorder"), prefix, Variant(500),
                          "Opc" + std::to_string(handle));
        n->AddTag(handle, "N7:0");
        ASSERT_FALSE(recorder->asked.empty());
        EXPECT_EQ(recorder->asked.back(), id) << ::testing::PrintToString(prefix);
        ++handle;
    }
    auto n = makeNode(Variant("Test.Recorder"), Variant("Static."));
    VbArray<std::string> names(1, std::vector<std::string>{"A", "B"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{1, 2});
    EXPECT_TRUE(opc(*n).AddItems(2, names, handles));
    EXPECT_EQ(std::vector<std::string>(recorder->asked.end() - 2, recorder->asked.end()),
              (std::vector<std::string>{"Static.A", "Static.B"}));
}

TEST_F(OpcDriver, AddItemReportsAFailingItemWithItsTagNameAndKeepsItsHandleSlotEmpty) {
    auto n = makeNode(Variant("Maroset.Simulation"), Variant("Bad."));
    ClsDriverOPC& d = opc(*n);
    EXPECT_FALSE(d.AddItem("Tank", 4));  // no item in the group: False
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].driver, "OPC Driver");
    EXPECT_EQ(host.errors[0].from, "ClsDriverOPC.AddItem");
    EXPECT_EQ(host.errors[0].message, "TagName: Tank Error: " + kUnknownItem);
    EXPECT_EQ(d.MaxHandle(), 4);
    EXPECT_EQ(d.ServerHandles().LBound(), 1);
    EXPECT_EQ(d.ServerHandles().items(), (std::vector<int32_t>{0, 0, 0, 0}));

    d.TagPrefex(Variant(""));
    EXPECT_TRUE(d.AddItem("Static.Level", 2));
    EXPECT_FALSE(d.AddItem("Nope", 3) == false);  // the group holds an item: True
    EXPECT_EQ(d.MaxHandle(), 4);
    EXPECT_GT(d.ServerHandles()(2), 0);
    EXPECT_EQ(d.ServerHandles()(3), 0);
    EXPECT_EQ(host.errors.size(), 2u);
    EXPECT_TRUE(wasTraced("Opc: AddItem Nope (handle 3): 0xC0040007 " + kUnknownItem));
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, AddItemsRepeatsTheFirstItemsErrorForEveryFailingItem) {
    auto n = makeNode();
    ClsDriverOPC& d = opc(*n);
    VbArray<std::string> names(1, std::vector<std::string>{"Bogus.1", "Static.A", "Bogus.2"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{7, 3, 5});
    EXPECT_TRUE(d.AddItems(3, names, handles));
    ASSERT_EQ(host.errors.size(), 2u);
    for (const auto& e : host.errors) {
        EXPECT_EQ(e.driver, "OPC Driver");
        EXPECT_EQ(e.from, "ClsDriverOPC.AddItems");
        EXPECT_EQ(e.message, " Error: " + kUnknownItem);
    }
    EXPECT_EQ(d.MaxHandle(), 7);
    EXPECT_EQ(d.ServerHandles().UBound(), 7);
    EXPECT_GT(d.ServerHandles()(3), 0);
    EXPECT_EQ(d.ServerHandles()(5), 0);
    EXPECT_EQ(d.ServerHandles()(7), 0);

    // When the first item is fine, its "error" is what the others are reported with.
    host.errors.clear();
    VbArray<std::string> more(1, std::vector<std::string>{"Ramp.B", "Bogus.3", "Bogus.4"});
    VbArray<int32_t> moreHandles(1, std::vector<int32_t>{8, 9, 10});
    EXPECT_TRUE(d.AddItems(3, more, moreHandles));
    ASSERT_EQ(host.errors.size(), 2u);
    EXPECT_EQ(host.errors[0].message, " Error: The operation completed successfully.");
    EXPECT_EQ(host.errors[1].message, host.errors[0].message);
    // The trace tells each item's own error.
    EXPECT_TRUE(wasTraced("Opc: AddItems Bogus.4 (handle 10): 0xC0040007 " + kUnknownItem));
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, DataChangesGoUpOnlyWhileActiveAndOnlyForChangedItems) {
    auto n = makeNode();
    n->AddTag(1, "Ramp.Seconds");
    n->AddTag(2, "Static.Setpoint");
    advance(3000ms);
    EXPECT_TRUE(host.changes.empty());  // inactive until scanning starts
    n->IsActive(true);
    advance(500ms);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].count, 2);
    EXPECT_EQ(host.changes[0].handlesLower, 1);
    EXPECT_EQ(host.changes[0].valuesLower, 1);
    EXPECT_EQ(reported(), (Reported{"1=3", "2=0"}));
    EXPECT_TRUE(wasTraced("Opc: DataChange 2 items"));

    n->WriteTag("2", Variant(42.5));
    advance(500ms);  // 4000 ms: the ramp and the written setpoint
    EXPECT_EQ(reported(), (Reported{"1=3", "2=0", "1=4", "2=42.5"}));
    advance(500ms);  // nothing changed
    EXPECT_EQ(host.changes.size(), 2u);

    n->IsActive(false);
    advance(5000ms);
    EXPECT_EQ(host.changes.size(), 2u);
    n->IsActive(true);  // every item again
    advance(500ms);
    EXPECT_EQ(host.changes.size(), 3u);
    EXPECT_EQ(host.changes[2].count, 2);
}

TEST_F(OpcDriver, ReadItemAnswersOnlyWhileActiveAndReportsUnknownHandles) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    n->AddTag(3, "Ramp.B");
    sim->SetStatic("Static.A", Variant("on"));
    n->ReadTag(1);
    advance(0ms);
    EXPECT_TRUE(host.changes.empty());  // inactive: the answer is dropped
    EXPECT_TRUE(wasTraced("Opc: AsyncReadComplete 1 items dropped (group inactive)"));

    n->IsActive(true);
    n->ReadTag(1);
    advance(0ms);
    EXPECT_EQ(reported(), Reported{"1=on"});

    n->ReadTag(2);  // below MaxHandle, but no item
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].driver, "OPC Driver");
    EXPECT_EQ(host.errors[0].from, "ClsDriverOPC.ReadItem");
    EXPECT_EQ(host.errors[0].message, "ClientHandle: 2 Error: " + kInvalidHandle);
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, HandlesAboveMaxHandleAreSubscriptErrorsLoggedUnderTheirProcedure) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    n->IsActive(true);
    // Retried until the burst passes 5; then the read goes on with server handle 0.
    EXPECT_NO_THROW(n->ReadTag(99));
    EXPECT_EQ(logCount("Module\\Sub: ClsDriverOPC.ReadItem 0"), 6u);
    EXPECT_EQ(logCount("Description: Subscript out of range"), 6u);
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].message, "ClientHandle: 99 Error: " + kInvalidHandle);

    advance(11s);  // a new burst
    EXPECT_NO_THROW(n->WriteTag("99", Variant(1)));
    EXPECT_EQ(logCount("ClsDriverOPC.WriteItem 0"), 6u);
    advance(11s);
    VbArray<Variant> block(0, std::vector<Variant>{Variant(1), Variant(2)});
    EXPECT_NO_THROW(n->WriteArray("99", block));
    EXPECT_EQ(logCount("ClsDriverOPC.WriteItem 0"), 12u);  // deliberately WriteItem's label
    EXPECT_EQ(logCount("WriteArray"), 0u);
    advance(11s);
    EXPECT_NO_THROW(n->RemoveTag(99));
    EXPECT_EQ(logCount("ClsDriverOPC.RemoveItem 0"), 6u);
    EXPECT_EQ(opc(*n).MaxHandle(), 1);
    EXPECT_EQ(host.errors.size(), 1u);  // write and remove errors are not reported
    advance(1000ms);
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(int32_t{0}));
}

TEST_F(OpcDriver, WritesReachTheServerAndComeBackThroughDataChanges) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    n->AddTag(2, "Ramp.B");
    n->IsActive(true);
    VbArray<Variant> block(0, std::vector<Variant>{Variant(1), Variant("two")});
    n->WriteArray("1", block);
    advance(0ms);
    EXPECT_EQ(sim->StaticValue("Static.A"), Variant(block));
    EXPECT_EQ(opc(*n).WriteItem(2, Variant(5)), 0);  // a ramp refuses, nothing reported
    EXPECT_TRUE(
        wasTraced("Opc: WriteItem handle 2: 0xC0040006 "
                  "The item's access rights do not allow the operation."));
    advance(500ms);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].values[0], Variant(block));
    EXPECT_TRUE(host.errors.empty());
}

TEST_F(OpcDriver, RemoveItemFreesTheHandleAndTheItemFallsSilent) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    n->AddTag(2, "Ramp.B");
    n->RemoveTag(2);
    EXPECT_EQ(opc(*n).ServerHandles()(2), 0);
    EXPECT_EQ(opc(*n).group()->OPCItems().Count(), 1);
    n->IsActive(true);
    advance(3000ms);
    EXPECT_EQ(reported(), Reported{"1=0"});
    n->RemoveTag(2);  // refused by the server: nothing changes, nothing is logged
    n->ReadTag(2);
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].message, "ClientHandle: 2 Error: " + kInvalidHandle);
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, ADataChangeWhoseFirstHandleIsNotPositiveIsDroppedWhole) {
    auto n = makeNode();
    n->AddTag(0, "Static.Z");  // the item is added; its handle has no slot (logged)
    EXPECT_EQ(logCount("ClsDriverOPC.AddItem 0"), 6u);
    n->AddTag(1, "Static.A");
    n->IsActive(true);
    advance(500ms);
    EXPECT_TRUE(host.changes.empty());
    EXPECT_TRUE(wasTraced("Opc: DataChange 2 items dropped (first client handle 0)"));
    sim->SetStatic("Static.A", Variant(5));
    advance(500ms);
    EXPECT_EQ(reported(), Reported{"1=5"});

    // The other way round only the first handle is looked at.
    auto m = makeNode(Variant("Maroset.Simulation"), Variant::Null(), Variant(500), "Opc2");
    m->AddTag(3, "Static.B");
    m->AddTag(-2, "Static.C");
    m->IsActive(true);
    advance(500ms);
    EXPECT_EQ(reported(), (Reported{"1=5", "3=0", "-2=0"}));
}

TEST_F(OpcDriver, TrapRulesPerProcedureWithTheSwitchOff) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    ClsDriverOPC& d = opc(*n);
    d.shutdown();
    EXPECT_FALSE(d.group());
    EXPECT_FALSE(d.server());
    EXPECT_EQ(sim->Connections(), 0);

    // Always trapped: logged, never raised.
    for (auto op : std::vector<std::function<void()>>{
             [&] { d.AddItem("Static.B", 2); }, [&] { d.RemoveItem(1); }, [&] { d.ReadItem(1); },
             [&] { d.WriteItem(1, Variant(1)); },
             [&] {
                 VbArray<Variant> a(1, 1);
                 d.WriteArray(1, a);
             },
             [&] {
                 VbArray<std::string> names(1, std::vector<std::string>{"Static.B"});
                 VbArray<int32_t> handles(1, std::vector<int32_t>{2});
                 d.AddItems(1, names, handles);
             },
             [&] { d.ConnectServer("Maroset.Simulation", "Again"); }}) {
        const size_t before = errorLogRecords();
        EXPECT_EQ(errorOf(op), 0);
        EXPECT_GT(errorLogRecords(), before);
    }
    // Ignoring errors: nothing raised, nothing logged.
    const size_t logged = errorLogRecords();
    int32_t code = OPC_E_BADRIGHTS;
    EXPECT_EQ(d.GetErrorString(code), "");
    d.PostMessage(code, "Host.Check");
    EXPECT_EQ(errorOf([&] { d.shutdown(); }), 0);
    EXPECT_EQ(errorLogRecords(), logged);
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].driver, "Opc");
    EXPECT_EQ(host.errors[0].message, "PostMessage...: ");
    // Following the switch: raised while it is off, logged once it is on.
    EXPECT_EQ(errorOf([&] { d.IsActive(true); }), err::ObjectNotSet);
    EXPECT_EQ(errorOf([&] { d.ConvertArrayToString(Variant(3)); }), err::TypeMismatch);
    EXPECT_EQ(errorOf([&] { d.ReadAllItems(); }), err::NotSupported);  // not a member at all
    EXPECT_EQ(errorLogRecords(), logged);
    runtime().trap().setEnabled(true);
    EXPECT_EQ(errorOf([&] { d.IsActive(true); }), 0);
    EXPECT_GT(errorLogRecords(), logged);
}

TEST_F(OpcDriver, ShutdownThenStartupDoesNotReconnect) {
    auto n = makeNode();
    ClsDriverOPC& d = opc(*n);
    d.shutdown();
    d.startup("Maroset.Simulation", "Opc");
    EXPECT_TRUE(d.Connected());
    EXPECT_FALSE(d.server());
    EXPECT_EQ(sim->Connections(), 0);
    // A fresh object does connect.
    ClsDriverOPC fresh;
    fresh.ScanRate(Variant(100));
    fresh.startup("Maroset.Simulation", "Fresh");
    EXPECT_EQ(sim->Connections(), 1);
    fresh.shutdown();
    EXPECT_EQ(sim->Connections(), 0);
}

TEST_F(OpcDriver, ServerTextsLoseTheirLastTwoCharactersWhenTheyHoldACrLf) {
    auto n = makeNode(Variant("Test.Recorder"));
    ClsDriverOPC& d = opc(*n);
    int32_t code = RecordingServer::SplitText;
    EXPECT_EQ(d.GetErrorString(code), "Vendor\r\nte");  // cut wherever the CR LF is
    code = RecordingServer::BareText;
    EXPECT_EQ(d.GetErrorString(code), "No line end");
    code = OPC_E_INVALIDHANDLE;
    EXPECT_EQ(d.GetErrorString(code), kInvalidHandle);
    code = 0x4242;
    EXPECT_EQ(d.GetErrorString(code), "");  // the server has no text: the error is ignored

    code = OPC_E_BADRIGHTS;
    d.PostMessage(code, "Host.Check");
    d.PostMessage(code);  // the contract's form: no FromSub
    ASSERT_EQ(host.errors.size(), 2u);
    EXPECT_EQ(host.errors[0].driver, "Opc");
    EXPECT_EQ(host.errors[0].from, "Host.Check");
    EXPECT_EQ(host.errors[0].message,
              "PostMessage...: The item's access rights do not allow the operation.");
    EXPECT_EQ(host.errors[1].from, "");
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, ConvertArrayToStringJoinsFromLowerToUpperBound) {
    ClsDriverOPC d;
    auto joined = [&](int32_t lower, std::vector<Variant> items) {
        return d.ConvertArrayToString(Variant(VbArray<Variant>(lower, std::move(items))));
    };
    EXPECT_EQ(joined(1, {Variant("a"), Variant("b"), Variant("c")}), "a,b,c");
    EXPECT_EQ(joined(0, {Variant("only")}), "only");
    EXPECT_EQ(joined(-1, {Variant(1), Variant::Null(), Variant(true), Variant(2.5), Variant()}),
              "1,,True,2.5,");
    EXPECT_EQ(joined(1, {}), "");
}

TEST_F(OpcDriver, AHostMayDropTheNodeInsideItsValueChange) {
    auto n = makeNode();
    n->AddTag(1, "Ramp.A");
    n->IsActive(true);
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { n.reset(); });
    advance(5000ms);
    EXPECT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(sim->Connections(), 0);
}

TEST_F(OpcDriver, AnErrorLeavingAnEventHandlerIsTracedAndTheUpdatesGoOn) {
    auto n = makeNode();
    n->AddTag(1, "Ramp.A");
    n->IsActive(true);
    int calls = 0;
    auto sub = host.host.ValueChange.subscribe([&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) {
        if (++calls == 1) throw VbError(err::InvalidProcedureCall);
    });
    advance(2000ms);  // changes at 500, 1000 and 2000 ms
    EXPECT_EQ(calls, 3);
    EXPECT_TRUE(
        wasTraced("Opc: error 5 in Maroset.ClsNodeDBInterface: Invalid procedure call or argument"))
        << ::testing::PrintToString(traced);
}

}  // namespace
}  // namespace maroset
