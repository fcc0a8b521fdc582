#include "drivers/wago/ClsDriverWagoIO.h"

#include <arpa/inet.h>

#include <array>

#include "core/EventProcedure.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"
#include "platform/LinkText.h"

namespace maroset {

namespace {

constexpr const char* kModule = "ClsDriverWagoIO";

using platform::IncidentKind;
using platform::MbtLibrary;

// Table types of the MBT read calls.
constexpr uint8_t kInputRegisters = 3;
constexpr uint8_t kHoldingRegisters = 4;
constexpr uint8_t kDiscreteInputs = 1;
constexpr uint8_t kCoils = 0;

// Outputs are read back above the area they are written to.
constexpr int32_t kReadBackOffset = 512;
constexpr int32_t kHighBitReadBackOffset = 4096;
constexpr int16_t kHighBitsFrom = 4095;

// A 16-bit integer holds the two bytes a one-word or one-bit read leaves in the buffer, in
// this machine's order: low byte first.
using Word = std::array<uint8_t, 2>;

int16_t fromBuffer(const Word& buffer) {
    return static_cast<int16_t>(buffer[0] | (buffer[1] << 8));
}

Word toBuffer(int16_t value) {
    const auto v = static_cast<uint16_t>(value);
    return {static_cast<uint8_t>(v & 0xFF), static_cast<uint8_t>(v >> 8)};
}

int16_t swapWord(int16_t value) {
    return static_cast<int16_t>(MbtLibrary::MBTSwapWord(static_cast<uint16_t>(value)));
}

// 16-bit arithmetic as the language does it: Overflow (6) past the range.
int16_t add16(int16_t a, int32_t b) {
    return CInt(Variant(static_cast<int32_t>(a) + b));
}

void yieldToPendingEvents() {
    Runtime::current().loop().pump();
}

// Why a coupler address is refused before anything is sent: MBTConnect takes only a dotted
// IPv4 address, so a host name or stray blanks fail on every pass.
std::string addressHint(const std::string& address) {
    in_addr parsed{};
    if (::inet_pton(AF_INET, address.c_str(), &parsed) == 1) return {};
    return "; IPAddress \"" + address + "\" is not a dotted IPv4 address such as 192.168.1.10";
}

// What an address of a tag makes of every scan pass, for a word at AddItem; empty when the
// tag is read as any other.
std::string passWarning(const std::string& prefix, int16_t address) {
    int32_t readBack = address;
    if (prefix == "OW")
        readBack += kReadBackOffset;
    else if (prefix == "OD")
        readBack += address < kHighBitsFrom ? kReadBackOffset : kHighBitReadBackOffset;
    else if (prefix != "IW" && prefix != "ID")
        return "no read polls it: \"" + prefix + "\" is none of IW, OW, ID, OD";
    if (readBack <= INT16_MAX) return {};
    return "its read-back address " + std::to_string(readBack) +
           " passes 32767: every scan pass stops at it with error 6 (Overflow), and the tags "
           "after it are not read";
}

}  // namespace

ClsDriverWagoIO::ClsDriverWagoIO()
    : mbt_([](uint16_t port) -> uint16_t {
          return port == CouplerPort ? static_cast<uint16_t>(Runtime::current().modbusPort())
                                     : port;
      }) {}

ClsDriverWagoIO::~ClsDriverWagoIO() {
    life_.reset();
    // The library closes what is still open.
}

std::string ClsDriverWagoIO::traceSource() const {
    const std::string name = NodeName();
    return name.empty() ? topic_ : name;
}

void ClsDriverWagoIO::incident(IncidentKind kind, std::string_view tag,
                               const platform::LinkIncident::TextSource& text) const {
    Runtime::current().incidents().report(traceSource(), kind, endpoint_, tag, text);
}

void ClsDriverWagoIO::tagStopsPass(const std::string& tag, const VbError& error) const {
    // The error alone does not say at which tag the pass ended.
    incident(IncidentKind::Error, tag, [&] {
        return "tag " + tag + " stops the pass: error " + std::to_string(error.number()) + " (" +
               error.description() + ")";
    });
}

void ClsDriverWagoIO::traceFailure(const std::string& call, int32_t status, IncidentKind kind,
                                   std::string_view tag) const {
    incident(kind, tag, [&] {
        std::string text = call + " failed: status " + std::to_string(status) + ", " +
                           platform::mbt::StatusText(status);
        const std::string& cause = mbt_.LastErrorText();
        if (!cause.empty() && cause != platform::mbt::StatusText(status))
            text += " (" + cause + ")";
        return text;
    });
}

// --- connection ---------------------------------------------------------------------------

void ClsDriverWagoIO::connect_to_coupler() {
    // A connect that is waiting in one of its yields is not started a second time (a pass or a
    // write that ran meanwhile found the driver not connected).
    if (connecting_) return;
    Procedure proc(kModule, "connect_to_coupler");
    const std::weak_ptr<int> alive = life_;
    connecting_ = true;
    struct Done {
        const std::weak_ptr<int>& alive;
        bool& connecting;
        ~Done() {
            if (!alive.expired()) connecting = false;
        }
    } done{alive, connecting_};

    proc.run([&] { status_ = Variant(int32_t{0}); });
    for (int i = 0; i < 3; ++i) {
        proc.run([&] { yieldToPendingEvents(); });
        if (alive.expired() || shutDown_) return;
    }
    // The coupler's port, whatever was configured.
    proc.run([&] { Port(Variant(int16_t{502})); });
    proc.run([&] { mbt_.MBTInit(); });
    proc.run([&] { releaseUnusedConnection(); });

    int32_t connectResult = -1;
    std::string address;
    proc.run([&] {
        address = CStr(IPAddress());
        endpoint_ = address + ":" + std::to_string(Runtime::current().modbusPort());
        incident(IncidentKind::Opening, {},
                 [&] { return "connecting to the coupler at " + endpoint_; });
        connectResult = mbt_.MBTConnect(address, CouplerPort, 0, RequestTimeout, handle_);
        if (connectResult != 0) {
            incident(IncidentKind::OpenFailed, {}, [&] {
                std::string text = "cannot connect to the coupler at " + endpoint_ + ": status " +
                                   std::to_string(connectResult) + ", " +
                                   platform::mbt::StatusText(connectResult);
                const std::string& cause = mbt_.LastErrorText();
                if (!cause.empty() && cause != platform::mbt::StatusText(connectResult))
                    text += " (" + cause + ")";
                return text + addressHint(address);
            });
        }
    });
    uint8_t exceptionStatus = 0;
    proc.run([&] {
        const int32_t result = mbt_.MBTReadExceptionStatus(handle_, exceptionStatus, nullptr, 0);
        status_ = Variant(result);
        if (result != 0 && connectResult == 0)
            traceFailure("MBTReadExceptionStatus", result, IncidentKind::OpenFailed);
    });
    proc.run([&] {
        if (connectResult == 0 && CLng(status_) == 0) {
            connected_ = true;
            incident(IncidentKind::Opened, {}, [&] {
                return "connected to the coupler at " + endpoint_ + ", exception status " +
                       platform::Hex(std::string(1, static_cast<char>(exceptionStatus)));
            });
        }
    });
}

void ClsDriverWagoIO::releaseUnusedConnection() {
    if (connected_ || handle_ == 0) return;
    mbt_.MBTDisconnect(handle_);
    handle_ = 0;
}

void ClsDriverWagoIO::disconnect_from_coupler() {
    Procedure proc(kModule, "disconnect_from_coupler");
    bool linked = false;
    proc.run([&] { linked = connected_; });
    if (linked) {
        proc.run([&] {
            status_ = Variant(mbt_.MBTDisconnect(handle_));
            handle_ = 0;
            incident(IncidentKind::Closed, {},
                     [&] { return "disconnected from the coupler at " + endpoint_; });
        });
        proc.run([&] { mbt_.MBTExit(); });
    }
    proc.run([&] { connected_ = false; });
}

void ClsDriverWagoIO::WagoIOError() {
    Procedure proc(kModule, "WagoIOError");
    proc.run([&] {
        incident(IncidentKind::Note, {}, [&] {
            return "reconnecting to the coupler at " + CStr(IPAddress()) + " (last " + endpoint_ +
                   ")";
        });
    });
    proc.run([&] { disconnect_from_coupler(); });
    proc.run([&] { connect_to_coupler(); });
}

// --- contract -----------------------------------------------------------------------------

void ClsDriverWagoIO::shutdown() {
    Procedure proc(kModule, "shutdown");
    proc.run([&] { shutDown_ = true; });
    proc.run([&] { disconnect_from_coupler(); });
    proc.run([&] { releaseUnusedConnection(); });
    // Unloads the scan owner; a pass in progress notices and ends.
    proc.run([&] {
        pollTime_.reset();
        form_.reset();
    });
}

void ClsDriverWagoIO::startup(std::string, std::string TopicName) {
    Procedure proc(kModule, "startup");
    proc.run([&] { topic_ = TopicName; });
    proc.run([&] { shutDown_ = false; });
    proc.run([&] {
        form_ = std::make_unique<FrmWagoTCP>(Runtime::current().loop());
        pollTime_ = form_->PollTime.subscribe([this] { FrmWagoTCP_PollTime(); });
    });
    proc.run([&] {
        if (!form_) throw VbError(err::ObjectNotSet);
        form_->TmrScanRate.Interval(CLng(ScanRate()));
    });
    proc.run([&] {
        if (!form_) throw VbError(err::ObjectNotSet);
        form_->TmrScanRate.Enabled(false);
    });
    proc.run([&] { connect_to_coupler(); });
}

void ClsDriverWagoIO::ConnectServer(const std::string&, const std::string&) {}

void ClsDriverWagoIO::IsActive(bool Active) {
    Procedure proc(kModule, "IsActive");
    proc.run([&] {
        if (!form_) throw VbError(err::ObjectNotSet);
        form_->TmrScanRate.Enabled(Active);
    });
}

void ClsDriverWagoIO::RemoveItem(int16_t) {}

std::string ClsDriverWagoIO::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverWagoIO::WriteItem(int32_t ClientHandle, const Variant& data) {
    Procedure proc(kModule, "WriteItem");
    proc.run([&] { status_ = Variant(int32_t{0}); });
    bool linked = false;
    proc.run([&] { linked = connected_; });
    if (!linked) {
        // The value is not written: the driver reconnects, and the host writes again.
        proc.run([&] { WagoIOError(); });
        return 0;
    }

    int32_t i = 0;
    proc.run([&] {
        i = 0;
        while (i < tagCount_ && clientHandles_(i) != ClientHandle) ++i;
    });
    std::string name;
    // Past the last tag for a handle never added: Subscript out of range.
    proc.run([&] { name = CStr(tagNames_(i)); });
    int16_t address = 0;
    proc.run([&] { address = CInt(Variant(Mid(name, 3))); });
    if (name.size() > 1) {
        std::string prefix;
        proc.run([&] { prefix = UCase(Left(name, 2)); });
        // Plain addresses: the read-back offsets are for reading only.
        if (prefix == "OW") {
            proc.run([&] {
                const Word buffer = toBuffer(swapWord(CInt(data)));
                const int32_t result = mbt_.MBTWriteRegisters(
                    handle_, static_cast<uint16_t>(address), 1, buffer, nullptr, 0);
                status_ = Variant(result);
                if (result != 0)
                    traceFailure("writing " + name + ": MBTWriteRegisters(" +
                                     std::to_string(address) + ", 1)",
                                 result, IncidentKind::Refused, name);
            });
        } else if (prefix == "OD") {
            proc.run([&] {
                // Any value other than 0 sets the bit.
                const Word buffer = toBuffer(CInt(data) != 0 ? 1 : 0);
                const int32_t result = mbt_.MBTWriteCoils(handle_, static_cast<uint16_t>(address),
                                                          1, buffer, nullptr, 0);
                status_ = Variant(result);
                if (result != 0)
                    traceFailure(
                        "writing " + name + ": MBTWriteCoils(" + std::to_string(address) + ", 1)",
                        result, IncidentKind::Refused, name);
            });
        }
    }
    bool failed = false;
    proc.run([&] { failed = CLng(status_) != 0; });
    if (failed) proc.run([&] { WagoIOError(); });
    return 0;
}

bool ClsDriverWagoIO::AddItem(const std::string& TagName, int16_t ClientHandle) {
    Procedure proc(kModule, "AddItem");
    std::string name = TagName;
    proc.run([&] {
        // Bit tags in word.bit notation become plain bit numbers: ID2.3 is ID35.
        const std::string rest = Mid(TagName, 3);
        const int32_t dot = InStr(rest, ".");
        if (UCase(Mid(TagName, 2, 1)) == "D" && dot > 0) {
            const int16_t word = CInt(Variant(Left(rest, dot - 1)));
            const int16_t bit = CInt(Variant(Mid(rest, dot + 1)));
            const int16_t number = CInt(Variant(static_cast<int32_t>(word) * 16 + bit));
            name = Left(TagName, 2) + CStr(Variant(number));
        }
    });
    proc.run([&] {
        tagNames_.ReDimPreserve(tagCount_);
        clientHandles_.ReDimPreserve(tagCount_);
        lastValues_.ReDimPreserve(tagCount_);
    });
    proc.run([&] { tagNames_(tagCount_) = Variant(name); });
    proc.run([&] { clientHandles_(tagCount_) = ClientHandle; });
    proc.run([&] { lastValues_(tagCount_) = Variant(); });
    proc.run([&] {
        tagCount_ = CInt(Variant(static_cast<int32_t>(tagCount_) + 1));
        parsed_.resize(static_cast<size_t>(tagCount_));
        ParsedTag& p = parsed_.back();
        p = {};
        if (name.size() > 1) {
            try {
                p.address = CInt(Variant(Mid(name, 3)));
                p.prefix = UCase(Left(name, 2));
                p.known = true;
            } catch (const VbError& e) {
                // Left to the scan, which fails on it each pass.
                incident(IncidentKind::Note, name, [&] {
                    return "tag " + name + ": \"" + Mid(name, 3) +
                           "\" is not a tag number: every scan pass stops at it with error " +
                           std::to_string(e.number()) + " (" + e.description() +
                           "), and the tags after it are not read";
                });
            }
        } else {
            incident(IncidentKind::Note, name, [&] {
                return "tag \"" + name +
                       "\": no read polls it (a name of two letters and a number)";
            });
        }
        if (p.known) {
            const std::string warning = passWarning(p.prefix, p.address);
            if (!warning.empty())
                incident(IncidentKind::Note, name, [&] { return "tag " + name + ": " + warning; });
        }
    });
    return false;
}

bool ClsDriverWagoIO::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    return false;
}

int32_t ClsDriverWagoIO::ReadItem(int32_t) {
    return 0;
}

int32_t ClsDriverWagoIO::WriteArray(int32_t, VbArray<Variant>&) {
    return 0;
}

// --- scan ---------------------------------------------------------------------------------

void ClsDriverWagoIO::FrmWagoTCP_PollTime() {
    // The tick comes from the loop: an error that leaves the pass is traced and dropped, and
    // the next tick tries again. The source is copied: the pass may destroy the driver.
    const std::string source = traceSource();
    const std::string endpoint = endpoint_;
    RunEventProcedure(
        source, [this] { scan(); }, endpoint);
}

int16_t ClsDriverWagoIO::readTag(const std::string& prefix, int16_t address, bool& matched) {
    bool registers = true;
    uint8_t table = 0;
    int16_t start = address;
    matched = true;
    if (prefix == "IW") {
        table = kInputRegisters;
    } else if (prefix == "OW") {
        table = kHoldingRegisters;
        start = add16(address, kReadBackOffset);
    } else if (prefix == "ID") {
        registers = false;
        table = kDiscreteInputs;
    } else if (prefix == "OD") {
        registers = false;
        table = kCoils;
        start = address < kHighBitsFrom ? add16(address, kReadBackOffset)
                                        : add16(address, kHighBitReadBackOffset);
    } else {
        matched = false;
        return 0;
    }

    Word buffer{};
    const auto wire = static_cast<uint16_t>(start);
    const int32_t result = registers
                               ? mbt_.MBTReadRegisters(handle_, table, wire, 1, buffer, nullptr, 0)
                               : mbt_.MBTReadCoils(handle_, table, wire, 1, buffer, nullptr, 0);
    status_ = Variant(result);
    if (result != 0) {
        const std::string tag = prefix + std::to_string(address);
        traceFailure("reading " + tag + ": " + (registers ? "MBTReadRegisters(" : "MBTReadCoils(") +
                         std::to_string(table) + ", " + std::to_string(wire) + ", 1)",
                     result, IncidentKind::Refused, tag);
    }
    // Every register goes through the swap; a bit is already the value.
    return registers ? swapWord(fromBuffer(buffer)) : fromBuffer(buffer);
}

void ClsDriverWagoIO::scan() {
    Procedure proc(kModule, "FrmSelectTag.CmdOK_Click");
    const std::weak_ptr<int> alive = life_;

    bool linked = false;
    proc.run([&] { linked = connected_; });
    if (!linked) {
        proc.run([&] { WagoIOError(); });
        return;
    }

    int16_t n = 0;
    VbArray<int32_t> handles(1, 0);
    VbArray<Variant> values(1, 0);
    // The tags there are now; tags added while the pass yields wait for the next one.
    const int32_t last = tagCount_ - 1;
    for (int32_t i = 0; i <= last; ++i) {
        proc.run([&] { yieldToPendingEvents(); });
        if (alive.expired()) return;
        if (shutDown_) return;

        int16_t address = 0;
        std::string prefix;
        if (static_cast<size_t>(i) < parsed_.size() && parsed_[i].known) {
            address = parsed_[i].address;
            prefix = parsed_[i].prefix;
        } else {
            std::string name;
            proc.run([&] { name = CStr(tagNames_(i)); });
            if (name.size() <= 1) continue;
            proc.run([&] {
                try {
                    address = CInt(Variant(Mid(name, 3)));
                } catch (const VbError& e) {
                    tagStopsPass(name, e);
                    throw;
                }
            });
            proc.run([&] { prefix = UCase(Left(name, 2)); });
        }

        // A tag no read fills keeps the 0 it starts with.
        int16_t value = 0;
        bool matched = false;
        proc.run([&] { status_ = Variant(int32_t{0}); });
        proc.run([&] {
            try {
                value = readTag(prefix, address, matched);
            } catch (const VbError& e) {
                tagStopsPass(prefix + std::to_string(address), e);
                throw;
            }
        });

        bool failed = false;
        proc.run([&] { failed = matched && CLng(status_) != 0; });
        if (failed) {
            // The rest of the tags wait for the next tick; what changed before still goes up.
            proc.run([&] { WagoIOError(); });
            if (alive.expired()) return;
            break;
        }

        bool changed = false;
        proc.run([&] {
            const Variant& previous = lastValues_(i);
            changed = previous.isEmpty() || Compare(Variant(value), previous) != Ordering::Equal;
        });
        if (changed) {
            proc.run([&] {
                n = CInt(Variant(static_cast<int32_t>(n) + 1));
                handles.ReDimPreserve(n);
                values.ReDimPreserve(n);
                handles(n) = clientHandles_(i);
                values(n) = Variant(value);
                lastValues_(i) = Variant(value);
            });
        }
    }
    if (n > 0) proc.run([&] { ReportValues(*this, handles, values); });
}

}  // namespace maroset
