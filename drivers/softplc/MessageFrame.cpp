#include "drivers/softplc/MessageFrame.h"

#include "drivers/softplc/ModTCPIP.h"
#include "lang/Format.h"
#include "lang/Strings.h"

namespace maroset {

std::string MessageFrame::Build(std::string_view type, int32_t number, std::string_view data) {
    std::string frame;
    frame.reserve(data.size() + 24);
    frame += "<%";
    frame += Format(Variant(type), "@@@");
    frame += Format(Variant(number), "000");
    frame += ";~";
    frame += data;
    frame += ";~";
    frame += ModTCPIP::MessageCRC(frame);
    frame += "%>";
    return frame;
}

MessageFrame::Piece MessageFrame::Judge(std::string_view piece) {
    Piece out;
    if (piece.empty()) return out;
    if (piece.size() < MinimumPiece) {
        out.verdict = Verdict::TooShort;
        return out;
    }
    const std::string_view body = piece.substr(0, piece.size() - CrcDigits);
    if (piece.substr(body.size()) != ModTCPIP::MessageCRC(body)) {
        out.verdict = Verdict::BadCrc;
        return out;
    }
    out.verdict = Verdict::Good;
    out.type = Mid(body, 3, 3);
    out.number = Mid(body, 6, 3);
    out.payload = Mid(body, 9);
    return out;
}

}  // namespace maroset
