#include "drivers/softplc/ClsDriverNUVSoftPLC.h"

#include <vector>

#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "drivers/softplc/ConcatText.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {

// The driver was made from the OPC driver, and its error log still names that one.
constexpr const char* kModule = "ClsDriverOPC";
constexpr const char* kWriteItem = "ClsDriverOPC.WriteItem";

// The text the subscription and the writes are assembled in: one for every instance of the
// driver, holding the last text sent.
std::string& scratch() {
    static std::string text;
    return text;
}

std::string shortText(int32_t n) {
    return std::to_string(n);
}

}  // namespace

ClsDriverNUVSoftPLC::ClsDriverNUVSoftPLC() = default;

ClsDriverNUVSoftPLC::~ClsDriverNUVSoftPLC() {
    // A driver released without shutdown (a node initialised twice) still lets its socket go.
    if (client_) {
        dataArrival_.reset();
        client_->Form_Unload();
    }
}

FrmNUVTCPIP& ClsDriverNUVSoftPLC::requireClient() const {
    if (!client_) throw VbError(err::ObjectNotSet);
    return *client_;
}

void ClsDriverNUVSoftPLC::shutdown() {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "shutdown");
    proc.run([&] { IsActive(false); });
    proc.run([&] { requireClient().Winsock.Close(); });
    proc.run([&] { requireClient().Form_Unload(); });
    proc.run([&] {
        dataArrival_.reset();
        client_.reset();
    });
}

void ClsDriverNUVSoftPLC::startup(std::string ServerName, std::string TopicName) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "startup");
    proc.run([&] { Driver::ServerName(Variant(ServerName)); });
    proc.run([&] { OPCTopic(Variant(TopicName)); });
    if (clientCreated_) return;
    proc.run([&] {
        client_ = FrmNUVTCPIP::Create(NodeName());
        const std::weak_ptr<ClsDriverNUVSoftPLC> weak = weak_from_this();
        ClsDriverNUVSoftPLC* const raw = this;
        // No trap of its own: an error in it fails the client's data-arrival handler.
        dataArrival_ = client_->DataArrival.subscribe(
            [weak, raw](const std::string& id, const std::string& message, const std::string& ip,
                        const std::string& host) {
                const auto keep = weak.lock();  // null only for a driver not made shared
                raw->Client_DataArrival(id, message, ip, host);
            });
    });
    proc.run([&] { requireClient().Winsock.RemoteHost(CStr(IPAddress())); });
    proc.run([&] { requireClient().Winsock.RemotePort(CLng(Port())); });
    proc.run([&] { ConnectServer(ServerName, TopicName); });
    proc.run([&] { clientCreated_ = true; });
}

void ClsDriverNUVSoftPLC::ConnectServer(const std::string&, const std::string&) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "ConnectServer");
    proc.run([&] { requireClient().Winsock.RemoteHost(CStr(IPAddress())); });
    proc.run([&] { requireClient().Winsock.RemotePort(CLng(Port())); });
    proc.run([&] {
        FrmNUVTCPIP& client = requireClient();
        client.trace(platform::IncidentKind::Opening, "connecting to " + client.endpoint());
        client.Winsock.Connect();
    });
    // Twice, and no waiting: the connection may well not be up when this returns.
    proc.run([&] { Runtime::current().loop().pump(); });
    proc.run([&] { Runtime::current().loop().pump(); });
}

void ClsDriverNUVSoftPLC::PostMessage(int32_t&) {}

void ClsDriverNUVSoftPLC::PostMessage(int32_t, const std::string&) {}

void ClsDriverNUVSoftPLC::IsActive(bool Active) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "IsActive");
    if (!Active) {
        proc.run([&] { active_ = false; });
        proc.run([&] { requireClient().SendData("RSL", Variant(" ")); });
        return;
    }
    bool down = false;
    proc.run([&] { down = requireClient().Winsock.State() != platform::TcpClient::sckConnected; });
    if (down) {
        proc.run([&] { requireClient().Winsock.Close(); });
        proc.run([&] { ConnectServer("", ""); });
    }
    proc.run([&] { active_ = true; });
    proc.run([&] { scratch() = SubscriptionList(); });
    proc.run([&] { requireClient().SendData("TSL", Variant(scratch())); });
}

std::string ClsDriverNUVSoftPLC::SubscriptionList() const {
    std::string list = ConcatText(ScanRate()) + ";~" + shortText(tagCount_);
    for (int32_t i = 1; i <= tagCount_; ++i)
        list += ";~" + shortText(tagHandles_(i)) + ";~" + ConcatText(tagNames_(i));
    return list;
}

void ClsDriverNUVSoftPLC::RemoveItem(int16_t ClientHandle) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "RemoveItem");
    proc.run([&] {
        std::vector<int16_t> handles;
        std::vector<Variant> names;
        for (int32_t i = 1; i <= tagCount_; ++i) {
            if (tagHandles_(i) == ClientHandle) continue;
            handles.push_back(tagHandles_(i));
            names.push_back(tagNames_(i));
        }
        tagCount_ = static_cast<int16_t>(handles.size());
        tagHandles_ = VbArray<int16_t>(1, std::move(handles));
        tagNames_ = VbArray<Variant>(1, std::move(names));
    });
    proc.run([&] {
        if (active_) IsActive(true);
    });
}

std::string ClsDriverNUVSoftPLC::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverNUVSoftPLC::WriteItem(int32_t ClientHandle, const Variant& value) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, kWriteItem);
    proc.run([&] { scratch() = "1;~" + shortText(ClientHandle) + ";~" + ConcatText(value); });
    proc.run([&] { requireClient().SendData("NTV", Variant(scratch())); });
    // An error the trap resumed from is cleared by then: what is passed on is 0.
    const int32_t number = 0;
    proc.run([&] { PostMessage(number, kWriteItem); });
    return number;
}

bool ClsDriverNUVSoftPLC::AddItem(const std::string& TagName, int16_t ClientHandle) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "ClsDriverOPC.AddItem");
    bool result = false;
    proc.run([&] { tagCount_ = CInt(Variant(int32_t{tagCount_} + 1)); });
    proc.run([&] {
        tagHandles_.ReDimPreserve(tagCount_);
        tagNames_.ReDimPreserve(tagCount_);
    });
    proc.run([&] { tagNames_(tagCount_) = Variant(TagName); });
    proc.run([&] { tagHandles_(tagCount_) = ClientHandle; });
    proc.run([&] {
        if (active_) IsActive(true);
    });
    proc.run([&] { result = true; });
    return result;
}

bool ClsDriverNUVSoftPLC::AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                                   VbArray<int32_t>& ClientHandles) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "ClsDriverOPC.AddItems");
    bool result = false;
    int16_t total = tagCount_;
    proc.run([&] {
        if (NumItems < 0) throw VbError(err::InvalidProcedureCall);
        total = CInt(Variant(int32_t{tagCount_} + NumItems));
    });
    proc.run([&] {
        tagHandles_.ReDimPreserve(total);
        tagNames_.ReDimPreserve(total);
    });
    // The count moves only at the end: a list that fails half way (a handle above 32767)
    // adds none of its tags.
    for (int32_t i = 1; i <= NumItems && !proc.left(); ++i) {
        proc.run([&] { tagNames_(tagCount_ + i) = Variant(TagNames(i)); });
        proc.run([&] { tagHandles_(tagCount_ + i) = CInt(Variant(ClientHandles(i))); });
    }
    proc.run([&] { tagCount_ = total; });
    proc.run([&] {
        if (active_) IsActive(true);
    });
    proc.run([&] { result = true; });
    return result;
}

int32_t ClsDriverNUVSoftPLC::ReadItem(int32_t) {
    return 0;  // values arrive only when the server pushes them
}

int32_t ClsDriverNUVSoftPLC::ReadAllItems() {
    return 0;
}

int32_t ClsDriverNUVSoftPLC::WriteArray(int32_t ClientHandle, VbArray<Variant>& data) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, kWriteItem);
    proc.run([&] {
        const int32_t u = data.UBound();
        std::string text = shortText(u) + ";~" + shortText(ClientHandle);
        for (int32_t i = 0; i <= u - 1; ++i) text += ";~" + ConcatText(data(i));
        scratch() = std::move(text);
    });
    proc.run([&] { requireClient().SendData("ATV", Variant(scratch())); });
    const int32_t number = 0;
    proc.run([&] { PostMessage(number, kWriteItem); });
    return number;
}

std::string ClsDriverNUVSoftPLC::ConvertArrayToString(const Variant& vArrayData) {
    Procedure proc(kModule, "ConvertArrayToString");
    std::string text;
    proc.run([&] {
        const VbArray<Variant>& items = vArrayData.array();
        for (int32_t i = items.LBound(); i <= items.UBound(); ++i) {
            text += ConcatText(items(i));
            if (i < items.UBound()) text += ",";
        }
    });
    return text;
}

void ClsDriverNUVSoftPLC::Client_DataArrival(const std::string& MessageID,
                                             const std::string& Message, const std::string&,
                                             const std::string&) {
    // No trap here: an error goes to the client's handler, which logs it as its own. The
    // frame has been acknowledged by then.
    if (MessageID != "NTV") return;  // "SSD", "ERR", "MSG" and anything else: ignored
    const VbArray<std::string> fields = Split(Message, ";~");
    const int32_t n = CLng(Variant(fields(1)));
    if (n < 1) return;
    // Built as they are read, so a count far beyond the fields present fails at the first
    // missing field without reserving room for all of them.
    std::vector<int32_t> handles;
    std::vector<Variant> values;
    const size_t room = static_cast<size_t>(std::max(fields.UBound(), 0)) / 2;
    handles.reserve(std::min<size_t>(static_cast<size_t>(n), room));
    values.reserve(handles.capacity());
    for (int64_t i = 1; i <= n; ++i) {
        handles.push_back(CLng(Variant(fields(static_cast<int32_t>(2 * i)))));
        values.emplace_back(fields(static_cast<int32_t>(2 * i + 1)));
    }
    VbArray<int32_t> TagIDs(1, std::move(handles));
    VbArray<Variant> Values(1, std::move(values));
    ReportValues(*this, TagIDs, Values);
}

}  // namespace maroset
