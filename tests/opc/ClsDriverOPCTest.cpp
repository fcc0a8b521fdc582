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
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using namespace platform::opc;
using test::errorOf;
using Lines = std::vector<std::string>;

const std::string kUnknownItem =
    "The item ID is not defined in the server address space or no longer exists in the server "
    "address space.";
const std::string kInvalidHandle = "The value of the handle is invalid.";

// A server that accepts what the simulated one does, remembers the item IDs it was asked
// for, and has its own texts for two codes.
class RecordingServer final : public platform::OpcServerBackend {
  public:
    explicit RecordingServer(std::shared_ptr<platform::SimulationServer> sim) : sim_(sim) {}
    int32_t AddItem(const std::string& id,
                    std::shared_ptr<platform::OpcItemSource>& item) override {
        asked.push_back(id);
        return sim_->AddItem(id, item);
    }
    std::optional<std::string> ErrorText(int32_t code) const override {
        if (code == 1001) return std::string("Vendor\r\ntext");
        if (code == 1002) return std::string("No line end");
        return std::nullopt;
    }
    std::string VendorInfo() const override { return "recorder"; }
    Lines asked;

  private:
    std::shared_ptr<platform::SimulationServer> sim_;
};

// OPC nodes on the simulated server (or the recording one), on the virtual clock, with the
// host's events and the trace recorded.
class OpcDriver : public test::RuntimeFixture {
  protected:
    OpcDriver() {
        runtime().opcServers().Register("Maroset.Simulation", sim);
        runtime().opcServers().Register("Test.Recorder", recorder);
    }
    std::shared_ptr<node> makeNode(const char* server = "Maroset.Simulation",
                                   const Variant& prefix = Variant::Null(),
                                   const std::string& name = "Opc") {
        auto n = std::make_shared<node>();
        n->Name = name;
        n->DriverName = Variant("opc");
        n->ServerName = Variant(server);
        n->ScanRate = Variant(500);
        n->TagPrefex = prefix;
        n->Init();
        return n;
    }
    static ClsDriverOPC& opc(const node& n) { return dynamic_cast<ClsDriverOPC&>(*n.driver()); }
    // Every reported value so far as "handle=value".
    Lines reported() const {
        Lines out;
        for (const auto& c : host.changes)
            for (size_t i = 0; i < c.handles.size(); ++i)
                out.push_back(std::to_string(c.handles[i]) + "=" + CStr(c.values[i]));
        return out;
    }
    Lines messages() const {
        Lines out;
        for (const auto& e : host.errors) out.push_back(e.driver + "|" + e.from + "|" + e.message);
        return out;
    }
    size_t logged(const std::string& text) const {
        const std::string log = readDriveFile("MarosetErrors.txt");
        size_t n = 0;
        for (size_t at = log.find(text); at != std::string::npos; at = log.find(text, at + 1)) ++n;
        return n;
    }
    bool wasTraced(const std::string& line) const {
        return std::find(traced.begin(), traced.end(), line) != traced.end();
    }

    std::shared_ptr<platform::SimulationServer> sim =
        std::make_shared<platform::SimulationServer>(loop(), runtime().clock());
    std::shared_ptr<RecordingServer> recorder = std::make_shared<RecordingServer>(sim);
    test::HostRecorder host;
    test::IncidentRecorder incidents_;
    std::vector<std::string>& traced = incidents_.lines;
};

TEST_F(OpcDriver, StartupConnectsOnceAndShutdownLeavesItConnected) {
    auto n = makeNode();
    ClsDriverOPC& d = opc(*n);
    ASSERT_TRUE(d.Connected() && d.group());
    EXPECT_EQ(d.group()->Name(), "Opc");  // named after the node
    EXPECT_TRUE(d.group()->IsSubscribed());
    EXPECT_FALSE(d.group()->IsActive());
    EXPECT_EQ(d.group()->UpdateRate(), 500);
    EXPECT_EQ(sim->Connections(), 1);
    d.shutdown();
    EXPECT_EQ(sim->Connections(), 0);
    d.startup("Maroset.Simulation", "Opc");  // Connected stays set: no new connection
    EXPECT_TRUE(d.Connected());
    EXPECT_EQ(sim->Connections(), 0);
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, AnUnknownServerIsLoggedNotRaisedAndLeavesADeadDriver) {
    std::shared_ptr<node> n;
    ASSERT_EQ(errorOf([&] { n = makeNode("No.Such"); }), 0);
    // Connect retried until the burst passes 5, then one record per later statement.
    EXPECT_EQ(logged("Module\\Sub: ClsDriverOPC.ConnectServer 0"), 10u);
    EXPECT_EQ(logged("\"No.Such\""), 6u);
    EXPECT_TRUE(opc(*n).Connected());
    EXPECT_NO_THROW(n->AddTag(1, "Static.A"));  // always trapped
    EXPECT_TRUE(host.errors.empty());
    EXPECT_EQ(errorOf([&] { n->IsActive(true); }), err::ObjectNotSet);  // follows the switch
}

TEST_F(OpcDriver, ItemIdsAreThePrefixJoinedToTheTagName) {
    const std::vector<std::pair<Variant, std::string>> cases{{Variant("[Topic1]"), "[Topic1]N7:0"},
                                                             {Variant(""), "N7:0"},
                                                             {Variant::Null(), "N7:0"},
                                                             {Variant(int32_t{0}), "0N7:0"}};
    for (const auto& [prefix, id] : cases) {
        auto n = makeNode("Test.Recorder", prefix);
        n->AddTag(1, "N7:0");
        EXPECT_EQ(recorder->asked.back(), id);
    }
    auto n = makeNode("Test.Recorder", Variant("Static."));
    VbArray<std::string> names(1, Lines{"A", "B"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{1, 2});
    EXPECT_TRUE(opc(*n).AddItems(2, names, handles));
    EXPECT_EQ(Lines(recorder->asked.end() - 2, recorder->asked.end()),
              (Lines{"Static.A", "Static.B"}));
}

TEST_F(OpcDriver, AddItemReportsAFailingItemByTagNameAndLeavesItsSlotEmpty) {
    auto n = makeNode("Maroset.Simulation", Variant("Bad."));
    ClsDriverOPC& d = opc(*n);
    EXPECT_FALSE(d.AddItem("Tank", 4));  // the group holds no item
    d.TagPrefex(Variant(""));
    EXPECT_TRUE(d.AddItem("Static.Level", 2));
    EXPECT_TRUE(d.AddItem("Nope", 3));  // the group holds an item
    EXPECT_EQ(messages(),
              (Lines{"OPC Driver|ClsDriverOPC.AddItem|TagName: Tank Error: " + kUnknownItem,
                     "OPC Driver|ClsDriverOPC.AddItem|TagName: Nope Error: " + kUnknownItem}));
    EXPECT_EQ(d.MaxHandle(), 4);
    EXPECT_EQ(d.ServerHandles().LBound(), 1);
    EXPECT_EQ(d.ServerHandles().size(), 4);
    EXPECT_GT(d.ServerHandles()(2), 0);
    EXPECT_EQ(d.ServerHandles()(3) + d.ServerHandles()(4), 0);
    EXPECT_TRUE(wasTraced("Opc: AddItem Nope (handle 3): 0xC0040007 " + kUnknownItem));
}

TEST_F(OpcDriver, AddItemsRepeatsTheFirstItemsErrorForEveryFailingItem) {
    auto n = makeNode();
    ClsDriverOPC& d = opc(*n);
    VbArray<std::string> names(1, Lines{"Bogus.1", "Static.A", "Bogus.2"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{7, 3, 5});
    EXPECT_TRUE(d.AddItems(3, names, handles));
    const std::string unknown = "OPC Driver|ClsDriverOPC.AddItems| Error: " + kUnknownItem;
    EXPECT_EQ(messages(), (Lines{unknown, unknown}));
    EXPECT_EQ(d.MaxHandle(), 7);
    EXPECT_GT(d.ServerHandles()(3), 0);
    EXPECT_EQ(d.ServerHandles()(5) + d.ServerHandles()(7), 0);
    // A good first item lends its "error" to the failing ones; the trace has their own.
    host.errors.clear();
    VbArray<std::string> more(1, Lines{"Ramp.B", "Bogus.3", "Bogus.4"});
    VbArray<int32_t> moreHandles(1, std::vector<int32_t>{8, 9, 10});
    d.AddItems(3, more, moreHandles);
    const std::string ok =
        "OPC Driver|ClsDriverOPC.AddItems| Error: The operation completed successfully.";
    EXPECT_EQ(messages(), (Lines{ok, ok}));
    EXPECT_TRUE(wasTraced("Opc: AddItems Bogus.4 (handle 10): 0xC0040007 " + kUnknownItem));
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, ValuesGoUpOnlyWhileActiveAndOnlyWhenChanged) {
    auto n = makeNode();
    n->AddTag(1, "Ramp.Seconds");
    n->AddTag(2, "Static.Setpoint");
    n->ReadTag(1);
    advance(3000ms);
    EXPECT_TRUE(host.changes.empty());  // inactive: no data change, no read answer
    n->IsActive(true);
    advance(500ms);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].count, 2);
    EXPECT_EQ(host.changes[0].handlesLower + host.changes[0].valuesLower, 2);
    n->WriteTag("2", Variant(42.5));
    advance(1000ms);  // 4000 ms: the ramp and the setpoint; 4500 ms: nothing
    sim->SetStatic("Static.Setpoint", Variant("on"));
    n->ReadTag(2);
    advance(0ms);
    EXPECT_EQ(reported(), (Lines{"1=3", "2=0", "1=4", "2=42.5", "2=on"}));
    EXPECT_TRUE(wasTraced("Opc: DataChange 2 items"));
    n->IsActive(false);
    advance(5000ms);
    EXPECT_EQ(host.changes.size(), 3u);
    EXPECT_EQ(opc(*n).WriteItem(1, Variant(5)), 0);  // a ramp refuses; traced, not reported
    EXPECT_TRUE(
        wasTraced("Opc: WriteItem handle 1: 0xC0040006 "
                  "The item's access rights do not allow the operation."));
    VbArray<Variant> block(0, std::vector<Variant>{Variant(1), Variant("two")});
    n->WriteArray("2", block);  // the whole array is the item's value
    advance(0ms);
    EXPECT_EQ(sim->StaticValue("Static.Setpoint"), Variant(block));
    EXPECT_TRUE(host.errors.empty());
}

TEST_F(OpcDriver, ReadAndRemoveOfHandlesWithoutItems) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    n->AddTag(3, "Ramp.B");
    n->RemoveTag(3);
    EXPECT_EQ(opc(*n).ServerHandles()(3), 0);
    EXPECT_EQ(opc(*n).group()->OPCItems().Count(), 1);
    n->RemoveTag(3);  // refused by the server: nothing changes, nothing is logged
    n->ReadTag(2);
    EXPECT_EQ(messages(),
              Lines{"OPC Driver|ClsDriverOPC.ReadItem|ClientHandle: 2 Error: " + kInvalidHandle});
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(OpcDriver, HandlesAboveMaxHandleAreSubscriptErrorsLoggedUnderTheirProcedure) {
    auto n = makeNode();
    n->AddTag(1, "Static.A");
    // Retried until the burst passes 5; then the read goes on with server handle 0.
    EXPECT_NO_THROW(n->ReadTag(99));
    EXPECT_EQ(logged("Module\\Sub: ClsDriverOPC.ReadItem 0"), 6u);
    EXPECT_EQ(logged("Description: Subscript out of range"), 6u);
    EXPECT_EQ(messages(),
              Lines{"OPC Driver|ClsDriverOPC.ReadItem|ClientHandle: 99 Error: " + kInvalidHandle});
    const std::vector<std::pair<std::function<void()>, std::string>> ops{
        {[&] { n->WriteTag("99", Variant(1)); }, "ClsDriverOPC.WriteItem 0"},
        {[&] {
             VbArray<Variant> block(0, 1);
             n->WriteArray("99", block);
         },
         "ClsDriverOPC.WriteItem 0"},  // deliberately WriteItem's label
        {[&] { n->RemoveTag(99); }, "ClsDriverOPC.RemoveItem 0"}};
    for (const auto& [op, label] : ops) {
        advance(11s);  // a new burst
        const size_t before = logged(label);
        EXPECT_NO_THROW(op());
        EXPECT_EQ(logged(label), before + 6) << label;
    }
    EXPECT_EQ(logged("WriteArray"), 0u);
    EXPECT_EQ(host.errors.size(), 1u);  // write and remove errors are not reported
}

TEST_F(OpcDriver, ADataChangeWhoseFirstHandleIsNotPositiveIsDroppedWhole) {
    auto n = makeNode();
    n->AddTag(0, "Static.Z");  // the item is added; its handle has no slot (logged)
    EXPECT_EQ(logged("ClsDriverOPC.AddItem 0"), 6u);
    n->AddTag(1, "Static.A");
    n->IsActive(true);
    advance(500ms);
    EXPECT_TRUE(host.changes.empty());
    EXPECT_TRUE(wasTraced("Opc: DataChange 2 items dropped (first client handle 0)"));
    sim->SetStatic("Static.A", Variant(5));
    advance(500ms);
    // Only the first handle is looked at.
    auto m = makeNode("Maroset.Simulation", Variant::Null(), "Opc2");
    m->AddTag(3, "Static.B");
    m->AddTag(-2, "Static.C");
    m->IsActive(true);
    advance(500ms);
    EXPECT_EQ(reported(), (Lines{"1=5", "3=0", "-2=0"}));
}

TEST_F(OpcDriver, TrapRulesPerProcedureWithTheSwitchOff) {
    auto n = makeNode();
    ClsDriverOPC& d = opc(*n);
    d.shutdown();
    VbArray<Variant> values(1, 1);
    VbArray<std::string> names(1, Lines{"Static.B"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{2});
    for (const auto& op : std::vector<std::function<void()>>{
             [&] { d.AddItem("Static.B", 2); }, [&] { d.AddItems(1, names, handles); },
             [&] { d.RemoveItem(1); }, [&] { d.ReadItem(1); }, [&] { d.WriteItem(1, Variant(1)); },
             [&] { d.WriteArray(1, values); },
             [&] { d.ConnectServer("Maroset.Simulation", "X"); }}) {
        const size_t before = errorLogRecords();
        EXPECT_EQ(errorOf(op), 0);  // always trapped: logged, never raised
        EXPECT_GT(errorLogRecords(), before);
    }
    const size_t before = errorLogRecords();
    int32_t code = OPC_E_BADRIGHTS;
    EXPECT_EQ(d.GetErrorString(code), "");  // these ignore errors: nothing raised or logged
    d.PostMessage(code, "Host.Check");
    EXPECT_EQ(errorOf([&] { d.shutdown(); }), 0);
    EXPECT_EQ(messages(), Lines{"Opc|Host.Check|PostMessage...: "});
    EXPECT_EQ(errorOf([&] { d.IsActive(true); }), err::ObjectNotSet);  // these follow the switch
    EXPECT_EQ(errorOf([&] { d.ConvertArrayToString(Variant(3)); }), err::TypeMismatch);
    EXPECT_EQ(errorOf([&] { d.ReadAllItems(); }), err::NotSupported);  // not a member at all
    EXPECT_EQ(errorLogRecords(), before);
    runtime().trap().setEnabled(true);
    EXPECT_EQ(errorOf([&] { d.IsActive(true); }), 0);
    EXPECT_GT(errorLogRecords(), before);
}

TEST_F(OpcDriver, ServerTextsLoseTheirLastTwoCharactersWhenTheyHoldACrLf) {
    auto n = makeNode("Test.Recorder");
    ClsDriverOPC& d = opc(*n);
    for (const auto& [code, text] : std::vector<std::pair<int32_t, std::string>>{
             {1001, "Vendor\r\nte"},  // cut wherever the CR LF is
             {1002, "No line end"},
             {OPC_E_INVALIDHANDLE, kInvalidHandle},
             {0x4242, ""}}) {  // no text: the server's error is ignored
        int32_t c = code;
        EXPECT_EQ(d.GetErrorString(c), text);
    }
    int32_t code = OPC_E_BADRIGHTS;
    d.PostMessage(code, "Host.Check");
    d.PostMessage(code);  // the contract's form: no FromSub
    const std::string text = "PostMessage...: The item's access rights do not allow the operation.";
    EXPECT_EQ(messages(), (Lines{"Opc|Host.Check|" + text, "Opc||" + text}));
}

TEST_F(OpcDriver, ConvertArrayToStringJoinsFromLowerToUpperBound) {
    ClsDriverOPC d;
    const Variant abc(VbArray<Variant>(1, {Variant("a"), Variant("b"), Variant("c")}));
    const Variant mixed(VbArray<Variant>(-1, {Variant(1), Variant::Null(), Variant(true)}));
    EXPECT_EQ(d.ConvertArrayToString(abc), "a,b,c");
    EXPECT_EQ(d.ConvertArrayToString(Variant(VbArray<Variant>(0, {Variant(2.5)}))), "2.5");
    EXPECT_EQ(d.ConvertArrayToString(mixed), "1,,True");
}

TEST_F(OpcDriver, HostHandlersMayDropTheNodeOrFailWithoutStoppingTheUpdates) {
    auto n = makeNode();
    n->AddTag(1, "Ramp.A");
    n->IsActive(true);
    int calls = 0;
    auto sub = host.host.ValueChange.subscribe([&](auto&, int16_t, auto&) {
        if (++calls == 1) throw VbError(err::InvalidProcedureCall);
        if (calls == 3) n.reset();
    });
    advance(5000ms);  // changes at 500, 1000 and 2000 ms, then the node is gone
    EXPECT_EQ(calls, 3);
    EXPECT_EQ(sim->Connections(), 0);
    EXPECT_TRUE(wasTraced(
        "Opc: error 5 in Maroset.ClsNodeDBInterface: Invalid procedure call or argument"));
}

}  // namespace
}  // namespace maroset
