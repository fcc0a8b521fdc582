#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "core/Driver.h"
#include "drivers/wago/FrmWagoTCP.h"
#include "lang/Subscription.h"
#include "lang/VbArray.h"
#include "lang/VbError.h"
#include "platform/LinkIncident.h"
#include "platform/mbt/MbtLibrary.h"

namespace maroset {

// The driver of a WAGO Ethernet fieldbus coupler (type key "WAGOIO"), through the MBT
// Modbus/TCP client library. Every registered tag is read on each tick of the scan timer;
// changed values go up as one value report per pass.
//
// Tag addresses: two letters and a decimal number, in any letter case.
//   IW n  input word n        input registers (table 3) at n
//   OW n  output word n       holding registers (table 4) at n + 512 (the read-back area)
//   ID n  input bit n         discrete inputs (table 1) at n
//   OD n  output bit n        coils (table 0) at n + 512 below 4095, at n + 4096 from 4095 on
// Bit tags also take word.bit: ID2.3 is stored as ID35 (2 * 16 + 3). Values are 16-bit
// integers; registers are read as signed words, bits as 0 or 1. A tag of one character or less
// is skipped; other prefixes are read by nothing.
//
// Writes (OW, OD) go to the plain address, without the read-back offsets.
//
// The connection always goes to port 502 (the host may map it elsewhere, Runtime::modbusPort),
// and the Port property reads 502 once the driver has connected. After connecting, the
// coupler's exception status is read to test the link; only then is the driver connected.
// A failed read ends the pass and reconnects; a pass or a write that finds the driver not
// connected reconnects and does nothing else. Nothing of this is reported upward: the link
// trace shows it.
//
// The driver yields to pending events three times before each connect and before each tag of
// a pass, so the host's events, other drivers and writes run meanwhile; a handler may shut the
// driver down or destroy it then. It has no PostMessage and no ReadAllItems (438).
class ClsDriverWagoIO final : public Driver {
  public:
    ClsDriverWagoIO();
    ~ClsDriverWagoIO() override;

    const char* className() const override { return "ClsDriverWagoIO"; }

    // Disconnects and unloads the scan owner.
    void shutdown() override;
    // Makes the scan owner (timer interval ScanRate, disabled) and connects.
    void startup(std::string ServerName, std::string TopicName) override;
    // Does nothing.
    void ConnectServer(const std::string& ServerName, const std::string& TopicName);
    // Switches the scan timer on or off (91 before startup).
    void IsActive(bool Active) override;
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    // Writes an OW or OD tag; always returns 0. A handle never added fails with Subscript out
    // of range (9), a value out of 16-bit range with Overflow (6).
    int32_t WriteItem(int32_t ClientHandle, const Variant& data) override;
    // Registers a tag (word.bit converted); returns False.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    int32_t ReadItem(int32_t ClientHandle) override;
    // Reconnects: disconnect, then connect.
    void WagoIOError();
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // For hosts and tests that look inside.
    bool Connected() const { return connected_; }
    // Result of the last MBT call the driver kept (0 for success).
    const Variant& Status() const { return status_; }
    int16_t TagCount() const { return tagCount_; }
    // Zero-based, TagCount() entries: addresses as stored (word.bit converted), handles, and
    // the value last reported (Empty before the first pass that read the tag).
    const VbArray<Variant>& TagNames() const { return tagNames_; }
    const VbArray<int16_t>& ClientHandles() const { return clientHandles_; }
    const VbArray<Variant>& LastValues() const { return lastValues_; }
    // The scan owner (null before startup and after shutdown).
    FrmWagoTCP* ScanOwner() const { return form_.get(); }
    const platform::MbtLibrary& Mbt() const { return mbt_; }

    static constexpr uint16_t CouplerPort = 502;
    static constexpr uint32_t RequestTimeout = 100;  // ms

  private:
    void connect_to_coupler();
    void disconnect_from_coupler();
    void FrmWagoTCP_PollTime();
    // One pass over the tags (its log label is "FrmSelectTag.CmdOK_Click").
    void scan();
    // Reads one tag into a 16-bit value; `matched` is false for a prefix that reads nothing.
    int16_t readTag(const std::string& prefix, int16_t address, bool& matched);
    // Closes a connection whose link test failed, before the next connect replaces its handle.
    void releaseUnusedConnection();

    std::string traceSource() const;
    void incident(platform::IncidentKind kind, std::string_view tag,
                  const platform::LinkIncident::TextSource& text) const;
    void traceFailure(const std::string& call, int32_t status, platform::IncidentKind kind,
                      std::string_view tag = {}) const;
    void tagStopsPass(const std::string& tag, const VbError& error) const;

    // Expires when the driver goes: a pass or a connect that yielded checks it before it goes
    // on, since a handler may have destroyed the driver meanwhile.
    std::shared_ptr<int> life_ = std::make_shared<int>(0);
    platform::MbtLibrary mbt_;
    platform::MbtLibrary::Handle handle_ = 0;
    Variant status_;
    bool connected_ = false;
    // "address:port" of the coupler as last connected to (the port actually used).
    std::string endpoint_;
    int16_t tagCount_ = 0;
    VbArray<Variant> tagNames_;
    VbArray<int16_t> clientHandles_;
    VbArray<Variant> lastValues_;
    // What the scan reads from each tag's text, worked out once when the tag is added (a tag's
    // text never changes). A text that does not parse is not kept: the scan parses it afresh
    // each pass and fails there, as it would without this.
    struct ParsedTag {
        bool known = false;
        int16_t address = 0;
        std::string prefix;
    };
    std::vector<ParsedTag> parsed_;
    std::unique_ptr<FrmWagoTCP> form_;
    Subscription pollTime_;
    std::string topic_;
    bool connecting_ = false;
    bool shutDown_ = false;
};

}  // namespace maroset
