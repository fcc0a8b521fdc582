#include "core/DriverCatalog.h"

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "core/node.h"
#include "lang/Conversions.h"

namespace maroset {
namespace {

using Calls = std::vector<std::string>;

// A driver that writes down every property set and every startup, in order.
class RecordingDriver final : public Driver {
  public:
    const char* className() const override { return "RecordingDriver"; }
    void ScanRate(const Variant& v) override { calls.push_back("ScanRate=" + CStr(v)); }
    void NodeName(const std::string& v) override { calls.push_back("NodeName=" + v); }
    void OPCTopic(const Variant& v) override { calls.push_back("OPCTopic=" + CStr(v)); }
    void TagPrefex(const Variant& v) override { calls.push_back("TagPrefex=" + CStr(v)); }
    void IPAddress(const Variant& v) override { calls.push_back("IPAddress=" + CStr(v)); }
    void Port(const Variant& v) override { calls.push_back("Port=" + CStr(v)); }
    void startup(std::string server, std::string topic) override {
        calls.push_back("startup(" + server + "," + topic + ")");
    }
    Calls calls;
};

TEST(DriverCatalog, EachTypeKeyConfiguresItsDriverInItsOwnOrder) {
    node n;
    n.Name = "N1";
    n.ScanRate = Variant(500);
    n.OPCTopic = Variant("T");
    n.ServerName = Variant("S");
    n.TagPrefex = Variant("P:");
    n.IPAddress = Variant("10.0.0.2");
    n.Port = Variant(4000);
    n.SerialPort = Variant(3);  // never passed on
    n.BaudRate = Variant(9600);
    const std::map<std::string, std::pair<std::string, Calls>> expected = {
        {"MEMTAG", {"ClsDriverMemTag", {"NodeName=N1"}}},
        {"DISKTAG", {"ClsDriverDiskTag", {"startup(ServerName,N1)", "NodeName=N1"}}},
        {"OPC",
         {"ClsDriverOPC",
          {"OPCTopic=T", "ScanRate=500", "startup(S,N1)", "TagPrefex=P:", "NodeName=N1"}}},
        {"WAGOIO",
         {"ClsDriverWagoIO",
          {"ScanRate=500", "IPAddress=10.0.0.2", "Port=4000", "startup(WagoIO,N1)",
           "TagPrefex=P:", "NodeName=N1"}}},
        {"NUVINTECH",
         {"ClsDriverIntech", {"NodeName=N1", "ScanRate=500", "startup( ,N1)", "NodeName=N1"}}},
        {"NUVABDF1", {"ClsDriverNuvAbDf1", {"ScanRate=500", "startup( ,N1)", "NodeName=N1"}}},
        {"NUVTCPIP",
         {"ClsDriverNUVSoftPLC",
          {"ScanRate=500", "NodeName=N1", "IPAddress=10.0.0.2", "Port=4000",
           "startup(NUVTCPIP,N1)"}}},
    };
    ASSERT_EQ(DriverFamilies().size(), expected.size());
    for (const DriverFamily& family : DriverFamilies()) {
        const std::string key(family.typeKey);
        ASSERT_EQ(expected.count(key), 1u) << key;
        EXPECT_EQ(family.className, expected.at(key).first);
        EXPECT_EQ(&DriverFamilyOf(key), &family);
        RecordingDriver driver;
        family.configure(n, [&](const std::function<void(Driver&)>& step) { step(driver); });
        EXPECT_EQ(driver.calls, expected.at(key).second) << key;
    }
    EXPECT_EQ(DriverFamilyOf("XYZ").typeKey, "MEMTAG");
    EXPECT_EQ(DriverFamilyOf("").typeKey, "MEMTAG");
    EXPECT_EQ(DriverFamilyOf("opc").typeKey, "MEMTAG") << "keys arrive upper-cased";
}

}  // namespace
}  // namespace maroset
