// The application half of FrmNUVProSerial: data-table addresses and the typed read and write
// requests of the DF1 command set (CMD 0x0F, FNC 0xA2 / 0xAA with three address fields).

#include <string_view>

#include "core/Procedure.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {

constexpr const char* kModule = "FrmNUVProSerial";
constexpr const char* kInvalid = "Invalid PLC Address";
constexpr uint8_t DLE = Df1Receiver::DLE, STX = Df1Receiver::STX, ETX = Df1Receiver::ETX;

// The typed-logical file-type byte of each file type, and the file numbers the type may have.
struct FileTypeRow {
    std::string_view letters;
    const char* code;
    bool (*accepts)(int16_t file);
};

constexpr FileTypeRow kFileTypes[] = {
    {"S", "&H84", [](int16_t n) { return n < 256; }},
    {"B", "&H85", [](int16_t n) { return n == 3 || n >= 9; }},
    {"T", "&H86", [](int16_t n) { return n == 4 || n >= 9; }},
    {"C", "&H87", [](int16_t n) { return n == 5 || n >= 9; }},
    {"R", "&H88", [](int16_t n) { return n == 6 || n >= 9; }},
    {"N", "&H89", [](int16_t n) { return n == 7 || n >= 9; }},
    {"F", "&H8A", [](int16_t n) { return n >= 8; }},
    {"O", "&H8B", [](int16_t n) { return n < 256; }},
    {"I", "&H8C", [](int16_t n) { return n < 256; }},
    {"ST", "&H8D", [](int16_t n) { return n >= 9; }},
};

bool isDigit(std::string_view s) {
    return s.size() == 1 && s[0] >= '0' && s[0] <= '9';
}

}  // namespace

Variant FrmNUVProSerial::CheckAddress() {
    Procedure proc(kModule, "CheckAddress");
    Variant result;
    std::string a;
    proc.run([&] { a = CStr(plcAddress_); });

    // Element and sub-element are split at a point (N7:0.1) or a slash (B3:0/2).
    int32_t dot = 0;
    int32_t colon = 0;
    proc.run([&] { dot = InStr(3, a, "."); });
    proc.run([&] {
        if (dot < 3) dot = InStr(3, a, "/");
    });
    proc.run([&] {
        if (dot < 3) dot = 99;
    });
    proc.run([&] { colon = InStr(2, a, ":"); });

    bool twoLetters = false;
    proc.run([&] { twoLetters = !isDigit(Mid(a, 2, 1)); });
    if (twoLetters) {
        proc.run([&] { fileType_ = UCase(Left(a, 2)); });
        proc.run([&] { fileNumber_ = CInt(Variant(Mid(a, 3, colon - 3))); });
    } else {
        proc.run([&] { fileType_ = UCase(Left(a, 1)); });
        proc.run([&] { fileNumber_ = CInt(Variant(Mid(a, 2, colon - 2))); });
    }
    proc.run([&] { elementText_ = Mid(a, colon + 1, dot - colon - 1); });
    proc.run([&] {
        subElementText_ = UCase(Mid(a, dot + 1));
        if (subElementText_.empty()) subElementText_ = "0";
    });

    const FileTypeRow* row = nullptr;
    for (const FileTypeRow& r : kFileTypes) {
        if (r.letters == fileType_) row = &r;
    }
    if (!row) return Variant(kInvalid);
    proc.run([&] { fileTypeCode_ = row->code; });
    if (!row->accepts(fileNumber_)) return Variant(kInvalid);

    proc.run([&] {
        if (!(fileNumber_ < 256 && CDbl(Variant(elementText_)) <= 255)) result = Variant(kInvalid);
    });
    return result;
}

void FrmNUVProSerial::RefreshData() {
    const std::weak_ptr<int> life = life_;
    Procedure proc(kModule, "RefreshData");
    // One request at a time: a poll that finds the last one unfinished only clears the flag.
    if (awaitingReply_) {
        proc.run([&] { statusText_ = "Missed poll Tx"; });
        proc.run([&] { raiseComplete(statusText_, 3, platform::IncidentKind::Dropped); });
        if (life.expired()) return;
        proc.run([&] { awaitingReply_ = false; });
        return;
    }
    if (rx_.InMessage) {
        proc.run([&] { statusText_ = "Missed poll Rx"; });
        proc.run([&] { raiseComplete(statusText_, 3, platform::IncidentKind::Dropped); });
        if (life.expired()) return;
        proc.run([&] { rx_.InMessage = false; });
        return;
    }

    proc.run([&] {
        if (!port_.PortOpen()) openPort();
    });
    proc.run([&] { port_.RThreshold(1); });
    proc.run([&] { port_.InputLen(1); });
    proc.run([&] { busy_ = true; });
    proc.run([&] {
        ++transactionNumber_;
        if (transactionNumber_ > 16000) transactionNumber_ = 0;
    });
    proc.run([&] { txHeader_ = std::string{char(DLE), char(STX)}; });

    bool read = false;
    bool write = false;
    proc.run([&] { read = Compare(plcFunction_, Variant(int16_t{1})) == Ordering::Equal; });
    proc.run([&] { write = Compare(plcFunction_, Variant(int16_t{2})) == Ordering::Equal; });
    if (read || write) {
        proc.run([&] { txBuffer_(0) = plcNode_; });  // DST
        proc.run([&] { txBuffer_(1) = 0; });         // SRC: always 0, whatever PCNode says
        proc.run([&] { txBuffer_(2) = 0x0F; });      // CMD
        proc.run([&] { txBuffer_(3) = 0; });         // STS
        proc.run([&] { txBuffer_(4) = WordToByte(transactionNumber_, false); });
        proc.run([&] { txBuffer_(5) = WordToByte(transactionNumber_, true); });
        proc.run([&] { txBuffer_(6) = read ? 0xA2 : 0xAA; });
        proc.run([&] { txBuffer_(7) = CByte(Variant(int32_t{2 * plcWordCount_})); });
        proc.run([&] { txBuffer_(8) = CByte(Variant(fileNumber_)); });
        proc.run([&] { txBuffer_(9) = CByte(Variant(fileTypeCode_)); });
        proc.run([&] { txBuffer_(10) = CByte(Variant(elementText_)); });
        proc.run([&] { txBuffer_(11) = CByte(Variant(subElementText_)); });
        if (write) {
            // Each word's high byte is overwritten by the next word's low byte, so only a
            // single word goes out whole. Intended: it is how writes have always gone out.
            for (int32_t i = 1; i <= plcWordCount_; ++i) {
                proc.run([&] { txBuffer_(11 + i) = WordToByte(dataInt_(i - 1), false); });
                proc.run([&] { txBuffer_(12 + i) = WordToByte(dataInt_(i - 1), true); });
            }
        }
        proc.run([&] { txLast_ = static_cast<int16_t>(read ? 11 : 2 * plcWordCount_ + 11); });
        proc.run([&] { CalcCRC(txLast_, false); });
        proc.run([&] {
            txTrailer_ = std::string{char(DLE), char(ETX), char(crcLow_), char(crcHigh_)};
        });
    }
    // Any other function sends whatever the buffer held last.
    proc.run([&] { SendMessage(); });
}

}  // namespace maroset
