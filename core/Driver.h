#pragma once

#include <cstdint>
#include <string>

#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

// The contract every driver class offers to its node: nine configuration properties and
// twelve operations, with the names, argument orders and widths hosts call them by.
//
// A member a driver does not have fails with Object doesn't support this property or method
// (438), as a call by name would. Note the mixed handle widths: AddItem and RemoveItem take a
// 16-bit handle, every other operation a 32-bit one.
//
// Drivers report upward through the hidden façade's nodeDB (see ValueReport.h), never to
// their node. Every operation runs under the driver's own error trap, with the driver's class
// name as module name.
class Driver {
  public:
    virtual ~Driver() = default;

    // The driver's class name ("ClsDriverMemTag", ...), its module name in the error log.
    virtual const char* className() const = 0;

    // Configuration properties. Drivers that ignore one still accept its assignment.
    virtual Variant ScanRate() const { return scanRate_; }
    virtual void ScanRate(const Variant& v) { scanRate_ = v; }
    virtual std::string NodeName() const { return nodeName_; }
    virtual void NodeName(const std::string& v) { nodeName_ = v; }
    // The node this driver serves, as NodeName last set it: what its reports are filed under.
    const std::string& servedNode() const { return nodeName_; }
    virtual Variant OPCTopic() const { return opcTopic_; }
    virtual void OPCTopic(const Variant& v) { opcTopic_ = v; }
    virtual Variant ServerName() const { return serverName_; }
    virtual void ServerName(const Variant& v) { serverName_ = v; }
    virtual Variant SerialPort() const { return serialPort_; }
    virtual void SerialPort(const Variant& v) { serialPort_ = v; }
    virtual Variant BaudRate() const { return baudRate_; }
    virtual void BaudRate(const Variant& v) { baudRate_ = v; }
    virtual Variant TagPrefex() const { return tagPrefex_; }
    virtual void TagPrefex(const Variant& v) { tagPrefex_ = v; }
    virtual Variant IPAddress() const { return ipAddress_; }
    virtual void IPAddress(const Variant& v) { ipAddress_ = v; }
    virtual Variant Port() const { return port_; }
    virtual void Port(const Variant& v) { port_ = v; }

    // Operations, in the contract's order.
    virtual void shutdown() { missing(); }
    virtual void startup(std::string ServerName, std::string TopicName);
    virtual void PostMessage(int32_t& lError);
    virtual void IsActive(bool NewValue);
    virtual void RemoveItem(int16_t ClientHandle);
    virtual std::string GetErrorString(int32_t& lErrCode);
    virtual int32_t WriteItem(int32_t ClientHandle, const Variant& data);
    virtual bool AddItem(const std::string& TagName, int16_t ClientHandle);
    virtual bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                          VbArray<int32_t>& ClientHandles);
    virtual int32_t ReadItem(int32_t ClientHandle);
    virtual int32_t ReadAllItems();
    virtual int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data);

  protected:
    // Fails as a call of a member the driver lacks does.
    [[noreturn]] static void missing();

  private:
    Variant scanRate_;
    std::string nodeName_;
    Variant opcTopic_;
    Variant serverName_;
    Variant serialPort_;
    Variant baudRate_;
    Variant tagPrefex_;
    Variant ipAddress_;
    Variant port_;
};

}  // namespace maroset
