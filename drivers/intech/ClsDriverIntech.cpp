#include "drivers/intech/ClsDriverIntech.h"

#include "core/Procedure.h"
#include "core/ValueReport.h"
#include "drivers/intech/FrmNUVIntech.h"
#include "drivers/intech/IntechTagName.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {
constexpr const char* kModule = "ClsDriverIntech";
}

ClsDriverIntech::ClsDriverIntech() = default;

ClsDriverIntech::~ClsDriverIntech() {
    // A driver replaced without shutdown still lets go of its line.
    if (NUVIntech_) NUVIntech_->Unload();
}

FrmNUVIntech& ClsDriverIntech::owner() const {
    if (!NUVIntech_) throw VbError(err::ObjectNotSet);
    return *NUVIntech_;
}

void ClsDriverIntech::NodeName(const std::string& v) {
    Driver::NodeName(v);
    if (NUVIntech_) NUVIntech_->NodeName(v);
}

void ClsDriverIntech::startup(std::string, std::string TopicName) {
    Procedure proc(kModule, "startup");
    proc.run([&] {
        if (NUVIntech_) NUVIntech_->Unload();
        NUVIntech_ = std::make_shared<FrmNUVIntech>();
        // The node's name (given before startup) picks its port mapping; the topic is the
        // node's name too, for a host that starts the driver by hand.
        NUVIntech_->NodeName(NodeName().empty() ? TopicName : NodeName());
        readComplete_ = NUVIntech_->ReadComplete.subscribe(
            [this](VbArray<Variant>& names, VbArray<Variant>& values) {
                NUVIntech_ReadComplete(names, values);
            });
        complete_ = NUVIntech_->Complete.subscribe(
            [this](const std::string& message) { NUVIntech_Complete(message); });
    });
    proc.run([&] { owner().TmrScanRate.Interval(CLng(ScanRate())); });
    proc.run([&] { owner().TmrScanRate.Enabled(false); });
    // Port 1 at 9600,n,8,1 whatever the node says: required.
    proc.run([&] { owner().CommPort(1); });
    proc.run([&] { owner().CommSettings("9600,n,8,1"); });
    proc.run([&] { owner().CommTimeOut(1000); });
    proc.run([&] { owner().ErrorCheckMode("BCC"); });
    proc.run([&] { owner().PCNode(0); });
    proc.run([&] { owner().PLCNode(1); });
    proc.run([&] { owner().PLCWordCount(2); });
}

void ClsDriverIntech::shutdown() {
    Procedure proc(kModule, "shutdown");
    // The tag table is kept.
    proc.run([&] {
        if (NUVIntech_) NUVIntech_->Unload();
        readComplete_.reset();
        complete_.reset();
        NUVIntech_.reset();
    });
}

void ClsDriverIntech::PostMessage(int32_t&) {}

void ClsDriverIntech::IsActive(bool Active) {
    Procedure proc(kModule, "IsActive");
    proc.run([&] { owner().TmrScanRate.Enabled(Active); });
}

void ClsDriverIntech::RemoveItem(int16_t) {}

std::string ClsDriverIntech::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverIntech::WriteItem(int32_t ClientHandle, const Variant& value) {
    Procedure proc(kModule, "WriteItem");
    std::string name, address;
    proc.run([&] {
        for (int32_t j = 1; j <= TagCount_; ++j) {
            if (TagHandles_(j) == ClientHandle) {
                name = CStr(TagNames_(j));
                break;
            }
        }
    });
    proc.run([&] {
        // The point number does not change the command: output "001" is always written.
        if (name.size() > 5) address = Left(name, 2);
    });
    proc.run([&] {
        // Joined as text is joined: Null adds nothing.
        const std::string text = value.isNull() ? std::string() : CStr(value);
        owner().SendCommand("@" + address + "EX DO 001" + text + " 0000:");
    });
    return 0;
}

bool ClsDriverIntech::AddItem(const std::string& TagName, int16_t ClientHandle) {
    Procedure proc(kModule, "AddItem");
    std::string command;
    proc.run([&] { command = IntechTagName::ReadCommand(TagName); });
    if (command.empty()) {
        owner().incident(platform::IncidentKind::Note, TagName, [&] {
            return "tag " + TagName +
                   ": no poll command reads it (LAI 1-16, EAI 1-64, LDI, LDO after a two-character "
                   "station address), so it never gets a value";
        });
    }
    proc.run([&] {
        TagCount_ = CInt(Variant(static_cast<int32_t>(TagCount_) + 1));
        TagNames_.ReDimPreserve(TagCount_ + 1);
        TagHandles_.ReDimPreserve(TagCount_ + 1);
        // Every tag is reported again on its next reply: intended.
        LastValues_.ReDim(1, TagCount_ + 1);
    });
    proc.run([&] {
        TagNames_(TagCount_) = Variant(TagName);
        TagHandles_(TagCount_) = ClientHandle;
    });
    bool found = false;
    proc.run([&] {
        // Up to CommandCount inclusive: reading that index enlarges the list, so a command
        // found among the others leaves an empty entry at the end, which the next new command
        // fills. An empty command matches that entry and is never added.
        for (int32_t j = 0; j <= CommandCount_; ++j) {
            if (owner().PollCommand(j) == command) found = true;
        }
    });
    proc.run([&] {
        if (found) return;
        owner().PollCommand(CommandCount_, command);
        ++CommandCount_;
    });
    return false;
}

bool ClsDriverIntech::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    return false;
}

int32_t ClsDriverIntech::ReadItem(int32_t) {
    return 0;
}

int32_t ClsDriverIntech::ReadAllItems() {
    return 0;
}

int32_t ClsDriverIntech::WriteArray(int32_t, VbArray<Variant>&) {
    return 0;
}

void ClsDriverIntech::NUVIntech_ReadComplete(VbArray<Variant>& TagNames, VbArray<Variant>& Values) {
    // The host's handler may release this driver: it stays alive until the report returns.
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "NUVIntech_ReadComplete");
    VbArray<int32_t> handles(1, 0);
    VbArray<Variant> values(1, 0);
    int32_t k = 0;
    proc.run([&] {
        for (int32_t i = TagNames.LBound(); i <= TagNames.UBound(); ++i) {
            const std::string& name = TagNames(i).string();
            for (int32_t j = 1; j <= TagCount_; ++j) {
                const Variant& stored = TagNames_(j);
                if (!stored.isString() || stored.string() != name) continue;  // case-sensitive
                const Variant& value = Values(i);
                if (!LastValues_(j).isEmpty() && Compare(LastValues_(j), value) == Ordering::Equal)
                    continue;
                ++k;
                handles.ReDimPreserve(k);
                values.ReDimPreserve(k);
                values(k) = value;
                handles(k) = TagHandles_(j);
                LastValues_(j) = value;
            }
        }
    });
    proc.run([&] {
        if (k > 0) ReportValues(*this, handles, values);
    });
}

void ClsDriverIntech::NUVIntech_Complete(const std::string&) {}

}  // namespace maroset
