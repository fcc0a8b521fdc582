#include "drivers/df1/ClsDriverNuvAbDf1.h"

#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {

constexpr const char* kModule = "ClsDriverNuvAbDf1";

// The element number of an N7 tag address ("N7:12" -> 12).
int16_t elementOf(const Variant& address) {
    return CInt(Variant(Mid(CStr(address), 4)));
}

}  // namespace

ClsDriverNuvAbDf1::~ClsDriverNuvAbDf1() {
    pollTime_.reset();
    readComplete_.reset();
    complete_.reset();
}

FrmNUVProSerial& ClsDriverNuvAbDf1::owner() const {
    if (!NUVSerial_) throw VbError(err::ObjectNotSet);
    return *NUVSerial_;
}

void ClsDriverNuvAbDf1::shutdown() {
    Procedure proc(kModule, "shutdown");
    proc.run([&] {
        pollTime_.reset();
        readComplete_.reset();
        complete_.reset();
        NUVSerial_.reset();
    });
}

void ClsDriverNuvAbDf1::startup(std::string, std::string TopicName) {
    Procedure proc(kModule, "startup");
    proc.run([&] {
        topic_ = TopicName;
        NUVSerial_ = std::make_unique<FrmNUVProSerial>(TopicName);
        pollTime_ = NUVSerial_->PollTime.subscribe([this] { NUVSerial_PollTime(); });
        readComplete_ = NUVSerial_->ReadComplete.subscribe(
            [this](VbArray<Variant>& values) { NUVSerial_ReadComplete(values); });
        complete_ = NUVSerial_->Complete.subscribe(
            [this](const std::string& text, uint8_t level) { NUVSerial_Complete(text, level); });
    });
    proc.run([&] { owner().TmrScanRate.Interval(CLng(ScanRate())); });
    proc.run([&] { owner().TmrScanRate.Enabled(false); });
    // Port 1 and fixed line settings, whatever the node's CommPort and BaudRate hold.
    proc.run([&] { owner().CommPort(1); });
    proc.run([&] { owner().CommSettings("19200,n,8,1"); });
    proc.run([&] { owner().CommTimeOut(1000); });
    proc.run([&] { owner().ErrorCheckMode("CRC"); });
    proc.run([&] { owner().PCNode(0); });
    proc.run([&] { owner().PLCNode(1); });
    proc.run([&] { owner().PLCWordCount(2); });
}

void ClsDriverNuvAbDf1::PostMessage(int32_t&) {}

void ClsDriverNuvAbDf1::IsActive(bool NewValue) {
    Procedure proc(kModule, "IsActive");
    proc.run([&] { owner().TmrScanRate.Enabled(NewValue); });
}

void ClsDriverNuvAbDf1::RemoveItem(int16_t) {}

std::string ClsDriverNuvAbDf1::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverNuvAbDf1::WriteItem(int32_t ClientHandle, const Variant& data) {
    Procedure proc(kModule, "WriteItem");
    proc.run([&] {
        for (int32_t i = 0; i < tagCount_; ++i) {
            if (clientHandles_(i) == ClientHandle) {
                owner().PLCAddress(tagAddresses_(i));
                break;
            }
        }
    });
    // Found or not: an unknown handle writes to the address set last. Kept as it is.
    bool hasAddress = false;
    proc.run([&] { hasAddress = CStr(owner().PLCAddress()).size() > 1; });
    if (!hasAddress) return 0;
    proc.run([&] { owner().PLCWordCount(1); });
    proc.run([&] { owner().PLCFunction(Variant(int16_t{2})); });
    proc.run([&] { owner().DataInt(0, CInt(data)); });
    proc.run([&] { owner().RefreshData(); });
    return 0;
}

bool ClsDriverNuvAbDf1::AddItem(const std::string& TagName, int16_t ClientHandle) {
    Procedure proc(kModule, "AddItem");
    bool accepted = false;
    proc.run([&] {
        const std::string prefix = UCase(Left(TagName, 3));
        accepted = prefix == "N7:" || prefix == "N7;";
    });
    if (!accepted) return false;
    proc.run([&] { accepted = IsNumeric(Variant(Mid(TagName, 4))); });
    if (!accepted) return false;
    // Every number passes this range test; kept as it is.
    proc.run([&] {
        const int16_t element = CInt(Variant(Mid(TagName, 4)));
        accepted = element >= 0;
        if (!accepted) accepted = element < 100;
    });
    if (!accepted) return false;
    proc.run([&] {
        tagAddresses_.ReDimPreserve(tagCount_);
        clientHandles_.ReDimPreserve(tagCount_);
        values_.ReDimPreserve(tagCount_);
        tagAddresses_(tagCount_) = Variant(TagName);
        clientHandles_(tagCount_) = ClientHandle;
        values_(tagCount_) = Variant();
        ++tagCount_;
    });
    SortTags(proc);
    return false;
}

void ClsDriverNuvAbDf1::SortTags(Procedure& proc) {
    // Selection by lowest element. The chosen entry is marked "N7:-1" / -1 in the copy so it
    // is not taken again; the stored values are dropped, so every tag is reported anew.
    VbArray<Variant> addresses;
    VbArray<int16_t> handles;
    proc.run([&] {
        addresses = tagAddresses_;
        handles = clientHandles_;
        tagAddresses_.ReDim(0, tagCount_ - 1);
        clientHandles_.ReDim(0, tagCount_ - 1);
        offsets_.ReDim(0, tagCount_ - 1);
        values_.ReDim(0, tagCount_ - 1);
    });
    int32_t chosen = 0;
    for (int32_t i = 0; i < tagCount_; ++i) {
        proc.run([&] {
            int16_t lowest = 32767;
            for (int32_t j = 0; j < tagCount_; ++j) {
                const int16_t element = elementOf(addresses(j));
                if (element > -1 && element < lowest) {
                    lowest = element;
                    chosen = j;
                }
            }
            tagAddresses_(i) = addresses(chosen);
            clientHandles_(i) = handles(chosen);
            handles(chosen) = -1;
            addresses(chosen) = Variant("N7:-1");
        });
    }
    proc.run([&] {
        const int16_t first = elementOf(tagAddresses_(0));
        for (int32_t i = 0; i < tagCount_; ++i)
            offsets_(i) = static_cast<int16_t>(elementOf(tagAddresses_(i)) - first);
    });
    proc.run([&] { blockWordCount_ = static_cast<int16_t>(offsets_(tagCount_ - 1) + 1); });
}

bool ClsDriverNuvAbDf1::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    return false;
}

int32_t ClsDriverNuvAbDf1::ReadItem(int32_t) {
    return 0;
}

int32_t ClsDriverNuvAbDf1::ReadAllItems() {
    return 0;
}

int32_t ClsDriverNuvAbDf1::WriteArray(int32_t, VbArray<Variant>&) {
    return 0;
}

void ClsDriverNuvAbDf1::NUVSerial_PollTime() {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "NUVSerial_PollTime");
    // An empty table has no first tag: the poll fails with Subscript out of range.
    proc.run([&] { owner().PLCAddress(tagAddresses_(0)); });
    proc.run([&] { owner().PLCWordCount(CByte(Variant(blockWordCount_))); });
    proc.run([&] { owner().PLCFunction(Variant(int16_t{1})); });
    proc.run([&] { owner().RefreshData(); });
}

void ClsDriverNuvAbDf1::NUVSerial_ReadComplete(VbArray<Variant>&) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "NUVSerial_ReadComplete");
    VbArray<int32_t> handles(1, 0);
    VbArray<Variant> values(1, 0);
    for (int32_t k = 0; k < blockWordCount_; ++k) {
        for (int32_t j = 0; j < tagCount_; ++j) {
            proc.run([&] {
                if (offsets_(j) != k) return;
                const Variant word(owner().DataInt(k));
                if (values_(j).isEmpty() || Compare(word, values_(j)) != Ordering::Equal) {
                    const int32_t n = handles.size() + 1;
                    handles.ReDimPreserve(n);
                    values.ReDimPreserve(n);
                    handles(n) = clientHandles_(j);
                    values(n) = word;
                    values_(j) = word;
                }
            });
        }
    }
    if (handles.size() > 0) proc.run([&] { ReportValues(*this, handles, values); });
}

void ClsDriverNuvAbDf1::NUVSerial_Complete(const std::string&, uint8_t) {
    // Link incidents are not passed on: the port owner has told them on the link's incidents,
    // where a host commissioning the line sees them.
}

}  // namespace maroset
