#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "core/Driver.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "lang/Subscription.h"
#include "lang/VbArray.h"

namespace maroset {

// The driver of a "NUVABDF1" node: integer tags of data-table file N7 in an Allen-Bradley PLC
// on serial port 1, at the fixed line settings 19200,n,8,1 (whatever the node's CommPort and
// BaudRate say), DF1 full duplex through its port owner FrmNUVProSerial (PLC node 1, own
// node 0, CRC check, 1000 ms reply time-out).
//
// Tags are N7:n (or N7;n); every other address is ignored without a message. The tag table
// is kept in ascending element order, and each scan tick polls the whole span from the lowest
// to the highest element as one block read. A tag is reported when its word differs from the
// value last reported, and always the first time; adding a tag forgets the values, so every
// tag is reported again after the next read. WriteItem writes one word at once, even between
// polls; a write while a poll still awaits its DLE ACK is lost ("Missed poll Tx").
//
// Link incidents (NAKs, time-outs, bad checks) stay inside the port owner: they are not
// reported to the host, only written to the link trace.
class ClsDriverNuvAbDf1 final : public Driver,
                                public std::enable_shared_from_this<ClsDriverNuvAbDf1> {
  public:
    ClsDriverNuvAbDf1() = default;
    ~ClsDriverNuvAbDf1() override;

    const char* className() const override { return "ClsDriverNuvAbDf1"; }

    // Closes the port and releases the port owner.
    void shutdown() override;
    // Creates the port owner; TopicName (the node's name) picks the node's port mapping and
    // names its trace lines. Polling stays off until IsActive(true).
    void startup(std::string ServerName, std::string TopicName) override;
    void PostMessage(int32_t& lError) override;
    // Switches the scan timer on or off.
    void IsActive(bool NewValue) override;
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    // Writes the value as one word to the tag's address; a handle that is not in the table
    // writes to the address set last (normally the lowest tag, set by the last poll).
    int32_t WriteItem(int32_t ClientHandle, const Variant& data) override;
    // Returns False, also for a tag it registered.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    int32_t ReadItem(int32_t ClientHandle) override;
    int32_t ReadAllItems() override;
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // The port owner (null before startup and after shutdown).
    FrmNUVProSerial* NUVSerial() const { return NUVSerial_.get(); }
    // The tag table, in element order.
    const VbArray<Variant>& TagAddresses() const { return tagAddresses_; }
    const VbArray<int16_t>& ClientHandles() const { return clientHandles_; }
    const VbArray<int16_t>& Offsets() const { return offsets_; }
    int16_t BlockWordCount() const { return blockWordCount_; }

  private:
    void NUVSerial_PollTime();
    void NUVSerial_ReadComplete(VbArray<Variant>& values);
    void NUVSerial_Complete(const std::string& text, uint8_t level);
    void SortTags(Procedure& proc);
    FrmNUVProSerial& owner() const;

    VbArray<Variant> tagAddresses_;
    VbArray<int16_t> clientHandles_;
    VbArray<int16_t> offsets_;
    VbArray<Variant> values_;
    int16_t tagCount_ = 0;
    int16_t blockWordCount_ = 0;
    std::string topic_;

    std::unique_ptr<FrmNUVProSerial> NUVSerial_;
    Subscription pollTime_, readComplete_, complete_;
};

}  // namespace maroset
