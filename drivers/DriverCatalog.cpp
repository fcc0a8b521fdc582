#include "core/DriverCatalog.h"

#include "core/node.h"
#include "drivers/df1/ClsDriverNuvAbDf1.h"
#include "drivers/intech/ClsDriverIntech.h"
#include "drivers/local/ClsDriverDiskTag.h"
#include "drivers/local/ClsDriverMemTag.h"
#include "drivers/opc/ClsDriverOPC.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"
#include "drivers/wago/ClsDriverWagoIO.h"
#include "lang/Conversions.h"

namespace maroset {

namespace {

template <class T>
std::shared_ptr<Driver> make() {
    return std::make_shared<T>();
}

using Step = DriverFamily::Step;

void nodeName(const node& n, const Step& step) {
    step([&](Driver& d) { d.NodeName(n.Name); });
}

constexpr DriverFamily kFamilies[] = {
    {"MEMTAG", "ClsDriverMemTag", make<ClsDriverMemTag>, nodeName},
    {"DISKTAG", "ClsDriverDiskTag", make<ClsDriverDiskTag>,
     [](const node& n, const Step& step) {
         step([&](Driver& d) { d.startup("ServerName", n.Name); });
         nodeName(n, step);
     }},
    {"OPC", "ClsDriverOPC", make<ClsDriverOPC>,
     [](const node& n, const Step& step) {
         step([&](Driver& d) { d.OPCTopic(n.OPCTopic); });
         step([&](Driver& d) { d.ScanRate(n.ScanRate); });
         step([&](Driver& d) { d.startup(CStr(n.ServerName), n.Name); });
         step([&](Driver& d) { d.TagPrefex(n.TagPrefex); });
         nodeName(n, step);
     }},
    {"WAGOIO", "ClsDriverWagoIO", make<ClsDriverWagoIO>,
     [](const node& n, const Step& step) {
         step([&](Driver& d) { d.ScanRate(n.ScanRate); });
         step([&](Driver& d) { d.IPAddress(n.IPAddress); });
         step([&](Driver& d) { d.Port(n.Port); });
         step([&](Driver& d) { d.startup("WagoIO", n.Name); });
         step([&](Driver& d) { d.TagPrefex(n.TagPrefex); });
         nodeName(n, step);
     }},
    {"NUVINTECH", "ClsDriverIntech", make<ClsDriverIntech>,
     [](const node& n, const Step& step) {
         nodeName(n, step);
         step([&](Driver& d) { d.ScanRate(n.ScanRate); });
         step([&](Driver& d) { d.startup(" ", n.Name); });
         nodeName(n, step);  // a second time, as intended
     }},
    {"NUVABDF1", "ClsDriverNuvAbDf1", make<ClsDriverNuvAbDf1>,
     [](const node& n, const Step& step) {
         step([&](Driver& d) { d.ScanRate(n.ScanRate); });
         step([&](Driver& d) { d.startup(" ", n.Name); });
         nodeName(n, step);
     }},
    {"NUVTCPIP", "ClsDriverNUVSoftPLC", make<ClsDriverNUVSoftPLC>,
     [](const node& n, const Step& step) {
         step([&](Driver& d) { d.ScanRate(n.ScanRate); });
         nodeName(n, step);  // before startup, as intended
         step([&](Driver& d) { d.IPAddress(n.IPAddress); });
         step([&](Driver& d) { d.Port(n.Port); });
         step([&](Driver& d) { d.startup("NUVTCPIP", n.Name); });
     }},
};

}  // namespace

std::span<const DriverFamily> DriverFamilies() {
    return kFamilies;
}

const DriverFamily& DriverFamilyOf(std::string_view typeKey) {
    for (const DriverFamily& family : kFamilies) {
        if (family.typeKey == typeKey) return family;
    }
    return kFamilies[0];
}

}  // namespace maroset
