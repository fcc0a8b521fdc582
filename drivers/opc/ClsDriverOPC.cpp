#include "drivers/opc/ClsDriverOPC.h"

#include <cstdint>

#include "core/ClsNodeDBInterface.h"
#include "core/EventProcedure.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "core/nodeDB.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"
#include "platform/opc/OPCGroup.h"
#include "platform/opc/OPCServer.h"
#include "platform/opc/OpcErrors.h"

namespace maroset {

namespace {

constexpr const char* kModule = "ClsDriverOPC";
constexpr const char* kDriver = "OPC Driver";

using platform::IncidentKind;
using platform::OPCGroup;

// An object that a skipped statement left unset fails the statements that use it, as an
// unset object variable does.
template <class T>
T& use(const std::shared_ptr<T>& object) {
    if (!object) throw VbError(err::ObjectNotSet);
    return *object;
}

// A Variant joined to text as the language's & operator does it: Null joins as "".
std::string joinText(const Variant& v) {
    return v.isNull() ? std::string() : CStr(v);
}

// The value report of an event: the server's arrays as they came, with its count.
void NewValue(const Driver& from, VbArray<int32_t>& handles, int32_t numItems,
              VbArray<Variant>& values) {
    // The count goes up as a 16-bit integer: Overflow beyond, as CInt would say.
    if (numItems < INT16_MIN || numItems > INT16_MAX) throw VbError(err::Overflow);
    ReportValues(from, handles, static_cast<int16_t>(numItems), values);
}

// An OPC error as the trace shows it: its code and, for a standard one, its words. Read from
// the table, not the server: words are built only when a reader wants them.
std::string errorWords(int32_t code) {
    std::string words = platform::opc::HexCode(code);
    if (auto text = platform::opc::StandardErrorText(code)) {
        if (text->ends_with("\r\n")) text->resize(text->size() - 2);
        words += " " + *text;
    }
    return words;
}

}  // namespace

ClsDriverOPC::ClsDriverOPC() = default;

ClsDriverOPC::~ClsDriverOPC() {
    // Unsubscribed before the group goes, so no event reaches a half-destroyed driver.
    setGroup(nullptr);
}

std::string ClsDriverOPC::traceSource() const {
    const std::string name = NodeName();
    return name.empty() ? topic_ : name;
}

template <class Text>
void ClsDriverOPC::trace(platform::IncidentKind kind, Text&& text, std::string_view tag) const {
    Runtime::current().incidents().report(traceSource(), kind, serverName_, tag, [&] {
        try {
            return std::string(text());
        } catch (const VbError& e) {
            // Words that cannot be built are not worth failing the statement for.
            return "(not told: error " + std::to_string(e.number()) + ")";
        }
    });
}

void ClsDriverOPC::setGroup(std::shared_ptr<OPCGroup> group) {
    dataChange_.reset();
    readComplete_.reset();
    writeComplete_.reset();
    group_ = std::move(group);
    if (!group_) return;
    // Called from the loop: an error that escapes a handler is traced and dropped there.
    dataChange_ = group_->DataChange.subscribe(
        [this](int32_t id, int32_t n, VbArray<int32_t>& handles, VbArray<Variant>& values,
               VbArray<int32_t>& qualities, VbArray<platform::DateTime>& stamps) {
            RunEventProcedure(traceSource(), [&] {
                MyOPCGroup_DataChange(id, n, handles, values, qualities, stamps);
            });
        });
    readComplete_ = group_->AsyncReadComplete.subscribe(
        [this](int32_t id, int32_t n, VbArray<int32_t>& handles, VbArray<Variant>& values,
               VbArray<int32_t>& qualities, VbArray<platform::DateTime>& stamps,
               VbArray<int32_t>& errors) {
            RunEventProcedure(traceSource(), [&] {
                MyOPCGroup_AsyncReadComplete(id, n, handles, values, qualities, stamps, errors);
            });
        });
    writeComplete_ = group_->AsyncWriteComplete.subscribe(
        [this](int32_t id, int32_t n, VbArray<int32_t>& handles, VbArray<int32_t>& errors) {
            RunEventProcedure(traceSource(),
                              [&] { MyOPCGroup_AsyncWriteComplete(id, n, handles, errors); });
        });
}

void ClsDriverOPC::shutdown() {
    Procedure proc(kModule, "shutdown", Procedure::Trap::ResumeNext);
    proc.run([&] { use(server_).OPCGroups().RemoveAll(); });
    proc.run([&] { setGroup(nullptr); });
    proc.run([&] { use(server_).Disconnect(); });
    proc.run([&] { server_.reset(); });
    // Connected stays set, as intended: this object never connects again.
}

void ClsDriverOPC::startup(std::string ServerName, std::string TopicName) {
    Procedure proc(kModule, "startup");
    if (connected_) return;
    topic_ = TopicName;
    proc.run(
        [&] { server_ = std::make_shared<platform::OPCServer>(Runtime::current().opcServers()); });
    if (!server_) return;  // creation failed: a later startup may try again
    proc.run([&] { ConnectServer(ServerName, TopicName); });
    proc.run([&] { connected_ = true; });
}

void ClsDriverOPC::ConnectServer(const std::string& strServerName,
                                 const std::string& strTopicName) {
    Procedure proc(kModule, "ConnectServer", Procedure::Trap::Always);
    proc.run([&] {
        serverName_ = strServerName;
        trace(IncidentKind::Opening, [&] { return "connecting to the OPC server " + serverName_; });
        try {
            use(server_).Connect(strServerName);
        } catch (const VbError& e) {
            trace(IncidentKind::OpenFailed, [&] {
                return "cannot connect to the OPC server " + serverName_ + ": error " +
                       std::to_string(e.number()) + " " + e.description();
            });
            throw;
        }
        trace(IncidentKind::Opened, [&] { return "connected to the OPC server " + serverName_; });
    });
    // The group is named after the node.
    proc.run([&] { setGroup(use(server_).OPCGroups().Add(Variant(strTopicName))); });
    proc.run([&] { use(group_).IsSubscribed(true); });
    // Updates start only with IsActive(True).
    proc.run([&] { use(group_).IsActive(false); });
    proc.run([&] { use(group_).UpdateRate(CLng(ScanRate())); });
}

void ClsDriverOPC::PostMessage(int32_t& lError) {
    PostMessage(lError, std::string());
}

void ClsDriverOPC::PostMessage(int32_t lError, const std::string& FromSub) {
    Procedure proc(kModule, "PostMessage", Procedure::Trap::ResumeNext);
    std::string text;
    proc.run([&] { text = use(server_).GetErrorString(lError); });
    proc.run([&] {
        if (InStr(text, "\r\n") > 0) text = Left(text, static_cast<int32_t>(text.size()) - 2);
    });
    proc.run([&] { ReportError(*this, NodeName(), FromSub, "PostMessage...: " + text); });
}

void ClsDriverOPC::IsActive(bool NewValue) {
    Procedure proc(kModule, "IsActive");
    // A C++ bool is the language's True (-1) or False, so the group is active only for True.
    proc.run([&] { use(group_).IsActive(NewValue); });
}

void ClsDriverOPC::RemoveItem(int16_t ClientHandle) {
    Procedure proc(kModule, "RemoveItem", Procedure::Trap::Always);
    VbArray<int32_t> handles(1, 1);
    VbArray<int32_t> errors;
    // A handle above MaxHandle fails here; the server then refuses server handle 0.
    proc.run([&] { handles(1) = serverHandles_(ClientHandle); });
    proc.run([&] { use(group_).OPCItems().Remove(1, handles, errors); });
    bool removed = false;
    proc.run([&] { removed = errors(1) == 0; });
    if (removed) proc.run([&] { serverHandles_(ClientHandle) = 0; });
}

std::string ClsDriverOPC::GetErrorString(int32_t& lErrCode) {
    Procedure proc(kModule, "GetErrorString", Procedure::Trap::ResumeNext);
    std::string text;
    proc.run([&] { text = use(server_).GetErrorString(lErrCode); });
    // The last two characters go whenever a CR LF is anywhere in the text, as intended.
    proc.run([&] {
        if (InStr(text, "\r\n") > 0) text = Left(text, static_cast<int32_t>(text.size()) - 2);
    });
    return text;
}

int32_t ClsDriverOPC::WriteItem(int32_t ClientHandle, const Variant& data) {
    Procedure proc(kModule, "WriteItem", Procedure::Trap::Always);
    VbArray<int32_t> handles(1, 1);
    VbArray<Variant> values(1, 1);
    VbArray<int32_t> errors;
    int32_t cancelID = 0;
    proc.run([&] { handles(1) = serverHandles_(ClientHandle); });
    proc.run([&] { values(1) = data; });
    proc.run([&] { use(group_).AsyncWrite(1, handles, values, errors, 0, cancelID); });
    // Write errors are not reported; the trace shows them.
    if (!errors.empty() && errors(1) != 0) {
        trace(IncidentKind::Refused, [&] {
            return "WriteItem handle " + std::to_string(ClientHandle) + ": " +
                   errorWords(errors(1));
        });
    }
    return 0;
}

int32_t ClsDriverOPC::WriteArray(int32_t ClientHandle, VbArray<Variant>& data) {
    // Logged as WriteItem, deliberately: the two share their log label.
    Procedure proc(kModule, "WriteItem", Procedure::Trap::Always);
    VbArray<int32_t> handles(1, 1);
    VbArray<Variant> values(1, 1);
    VbArray<int32_t> errors;
    int32_t cancelID = 0;
    proc.run([&] { handles(1) = serverHandles_(ClientHandle); });
    proc.run([&] { values(1) = Variant(data); });
    proc.run([&] { use(group_).AsyncWrite(1, handles, values, errors, 0, cancelID); });
    return 0;
}

bool ClsDriverOPC::AddItem(const std::string& TagName, int16_t ClientHandle) {
    Procedure proc(kModule, "AddItem", Procedure::Trap::Always);
    if (ClientHandle > maxHandle_) {
        proc.run([&] { maxHandle_ = ClientHandle; });
        proc.run([&] { serverHandles_.ReDimPreserve(ClientHandle); });
    }
    VbArray<std::string> itemIDs(1, 1);
    VbArray<int32_t> clientHandles(1, 1);
    VbArray<int32_t> handles;
    VbArray<int32_t> errors;
    proc.run([&] { itemIDs(1) = joinText(TagPrefex()) + TagName; });
    proc.run([&] { clientHandles(1) = ClientHandle; });
    proc.run([&] { use(group_).OPCItems().AddItems(1, itemIDs, clientHandles, handles, errors); });
    // A condition that fails under the trap counts as false.
    bool failed = false;
    proc.run([&] { failed = errors(1) != 0; });
    if (failed) {
        proc.run([&] {
            int32_t code = errors(1);
            const std::string text = GetErrorString(code);
            trace(
                IncidentKind::Refused,
                [&] {
                    return "AddItem " + itemIDs(1) + " (handle " + std::to_string(ClientHandle) +
                           "): " + platform::opc::HexCode(code) + " " + text;
                },
                itemIDs(1));
            ReportError(*this, kDriver, "ClsDriverOPC.AddItem",
                        "TagName: " + TagName + " Error: " + text);
        });
    } else {
        // A handle of 0 or below has no slot: this fails, and the item stays in the group.
        proc.run([&] { serverHandles_(ClientHandle) = handles(1); });
    }
    bool result = false;
    proc.run([&] { result = use(group_).OPCItems().Count() >= 1; });
    return result;
}

bool ClsDriverOPC::AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                            VbArray<int32_t>& ClientHandles) {
    Procedure proc(kModule, "AddItems", Procedure::Trap::Always);
    VbArray<std::string> itemIDs;
    proc.run([&] { itemIDs.ReDim(1, NumItems); });
    for (int32_t i = 1; i <= NumItems; ++i) {
        proc.run([&] { itemIDs(i) = joinText(TagPrefex()) + TagNames(i); });
        proc.run([&] {
            if (ClientHandles(i) > maxHandle_) maxHandle_ = CInt(Variant(ClientHandles(i)));
        });
    }
    proc.run([&] { serverHandles_.ReDimPreserve(maxHandle_); });
    VbArray<int32_t> handles;
    VbArray<int32_t> errors;
    proc.run([&] {
        use(group_).OPCItems().AddItems(NumItems, itemIDs, ClientHandles, handles, errors);
    });
    for (int32_t i = errors.LBound(); i <= errors.UBound(); ++i) {
        bool failed = false;
        proc.run([&] { failed = errors(i) != 0; });
        if (failed) {
            proc.run([&] {
                // The first item's error stands for every failing item, as intended; the
                // message names no tag.
                int32_t first = errors(1);
                const std::string text = GetErrorString(first);
                trace(
                    IncidentKind::Refused,
                    [&] {
                        return "AddItems " + itemIDs(i) + " (handle " +
                               std::to_string(ClientHandles(i)) + "): " + errorWords(errors(i));
                    },
                    itemIDs(i));
                ReportError(*this, kDriver, "ClsDriverOPC.AddItems", " Error: " + text);
            });
        } else {
            proc.run([&] { serverHandles_(ClientHandles(i)) = handles(i); });
        }
    }
    bool result = false;
    proc.run([&] { result = use(group_).OPCItems().Count() >= 1; });
    return result;
}

int32_t ClsDriverOPC::ReadItem(int32_t ClientHandle) {
    Procedure proc(kModule, "ReadItem", Procedure::Trap::Always);
    VbArray<int32_t> handles(1, 1);
    VbArray<int32_t> errors;
    int32_t cancelID = 0;
    // A handle above MaxHandle fails here; the server then refuses server handle 0, and that
    // error is reported.
    proc.run([&] { handles(1) = serverHandles_(ClientHandle); });
    proc.run([&] { use(group_).AsyncRead(1, handles, errors, 0, cancelID); });
    bool failed = false;
    proc.run([&] { failed = errors(1) != 0; });
    if (failed) {
        proc.run([&] {
            int32_t code = errors(1);
            const std::string text = GetErrorString(code);
            trace(IncidentKind::Refused, [&] {
                return "ReadItem handle " + std::to_string(ClientHandle) + ": " +
                       platform::opc::HexCode(code) + " " + text;
            });
            ReportError(*this, kDriver, "ClsDriverOPC.ReadItem",
                        "ClientHandle: " + std::to_string(ClientHandle) + " Error: " + text);
        });
    }
    return 0;
}

std::string ClsDriverOPC::ConvertArrayToString(const Variant& vArrayData) {
    Procedure proc(kModule, "ConvertArrayToString");
    std::string result;
    int32_t lower = 0;
    int32_t upper = -1;
    proc.run([&] { lower = vArrayData.array().LBound(); });
    proc.run([&] { upper = vArrayData.array().UBound(); });
    for (int32_t i = lower; i <= upper; ++i) {
        proc.run([&] { result += joinText(vArrayData.array()(i)); });
        if (i < upper) proc.run([&] { result += ","; });
    }
    return result;
}

void ClsDriverOPC::MyOPCGroup_DataChange(int32_t, int32_t NumItems, VbArray<int32_t>& ClientHandles,
                                         VbArray<Variant>& ItemValues, VbArray<int32_t>&,
                                         VbArray<platform::DateTime>&) {
    Procedure proc(kModule, "MyOPCGroup_DataChange");
    bool active = false;
    bool firstHandle = false;
    proc.run([&] {
        // Both halves are looked at, as the language's And does.
        active = use(group_).IsActive();
        firstHandle = ClientHandles(1) > 0;
    });
    if (!(active && firstHandle)) {
        trace(IncidentKind::Dropped, [&] {
            return "DataChange " + std::to_string(NumItems) + " items dropped (" +
                   (active ? "first client handle " + std::to_string(ClientHandles(1))
                           : std::string("group inactive")) +
                   ")";
        });
        return;
    }
    trace(IncidentKind::Received,
          [&] { return "DataChange " + std::to_string(NumItems) + " items"; });
    // Qualities and time stamps stay here. Nothing of this driver is touched after the
    // report: a host may drop the node while it handles it.
    proc.run([&] { NewValue(*this, ClientHandles, NumItems, ItemValues); });
}

void ClsDriverOPC::MyOPCGroup_AsyncReadComplete(int32_t, int32_t NumItems,
                                                VbArray<int32_t>& ClientHandles,
                                                VbArray<Variant>& ItemValues, VbArray<int32_t>&,
                                                VbArray<platform::DateTime>&, VbArray<int32_t>&) {
    Procedure proc(kModule, "MyOPCGroup_AsyncReadComplete");
    bool active = false;
    proc.run([&] { active = use(group_).IsActive(); });
    if (!active) {
        trace(IncidentKind::Dropped, [&] {
            return "AsyncReadComplete " + std::to_string(NumItems) +
                   " items dropped (group inactive)";
        });
        return;
    }
    trace(IncidentKind::Received,
          [&] { return "AsyncReadComplete " + std::to_string(NumItems) + " items"; });
    // Per-item errors are not looked at, and a failing report is ignored.
    Procedure report(kModule, "MyOPCGroup_AsyncReadComplete", Procedure::Trap::ResumeNext);
    report.run([&] { NewValue(*this, ClientHandles, NumItems, ItemValues); });
}

void ClsDriverOPC::MyOPCGroup_AsyncWriteComplete(int32_t, int32_t NumItems,
                                                 VbArray<int32_t>& ClientHandles,
                                                 VbArray<int32_t>& Errors) {
    Procedure proc(kModule, "MyOPCGroup_AsyncWriteComplete");
    // Every error is visited and none acted on; the trace shows the failed ones.
    for (int32_t i = 1; i <= NumItems; ++i) {
        proc.run([&] {
            int32_t code = Errors(i);
            if (code == 0) return;
            trace(IncidentKind::Refused, [&] {
                return "AsyncWriteComplete handle " + std::to_string(ClientHandles(i)) + ": " +
                       errorWords(code);
            });
        });
    }
}

}  // namespace maroset
