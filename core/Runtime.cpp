#include "core/Runtime.h"

#include <iostream>

#include "core/ClsNodeDBInterface.h"
#include "core/nodeDB.h"
#include "lang/Strings.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "platform/opcua/UaServerBackend.h"

namespace maroset {

namespace {

Runtime* current_ = nullptr;

Runtime& processDefault() {
    // Created on first use and kept for the life of the process.
    static Runtime* runtime = new Runtime();
    return *runtime;
}

}  // namespace

Runtime::Runtime()
    : Runtime(std::make_unique<platform::PollEventLoop>(),
              std::make_unique<platform::SystemClock>(), platform::FileSystem::DefaultDriveRoot()) {
}

Runtime::Runtime(std::unique_ptr<platform::EventLoop> loop, std::unique_ptr<platform::Clock> clock,
                 std::filesystem::path driveRoot)
    : loop_(std::move(loop)),
      clock_(std::move(clock)),
      files_(std::move(driveRoot)),
      messageBox_([](const std::string& text) { std::cerr << text << std::endl; }),
      trap_(*clock_, files_, [this](const std::string& text) { MsgBox(text); }),
      serialDevices_(*loop_),
      tcp_(*loop_) {
    // An OPC node whose server is an endpoint URL reaches that OPC UA server.
    opcServers_.RegisterScheme("opc.tcp", [this](const std::string& url) {
        return std::make_shared<platform::opcua::UaServerBackend>(*loop_, *clock_, tcp_, incidents_,
                                                                  url);
    });
}

Runtime::~Runtime() {
    // Nodes shut their drivers down while the loop, files and trap are still here.
    hidden_.reset();
    nodeDB_.reset();
}

Runtime& Runtime::current() {
    return current_ ? *current_ : processDefault();
}

Runtime* Runtime::exchange(Runtime* runtime) {
    Runtime* previous = current_;
    current_ = runtime;
    return previous;
}

void Runtime::MsgBox(const std::string& text) {
    if (messageBox_) messageBox_(text);
}

void Runtime::setMessageBox(MessageBox handler) {
    messageBox_ = std::move(handler);
}

std::string Runtime::serialDevice(int port, const std::string& node) const {
    if (!node.empty()) {
        if (auto it = serialPorts_.find({UCase(node), port}); it != serialPorts_.end())
            return it->second;
    }
    if (auto it = serialPorts_.find({std::string(), port}); it != serialPorts_.end())
        return it->second;
    return "/dev/ttyS" + std::to_string(port - 1);
}

void Runtime::mapSerialPort(int port, std::string device, const std::string& node) {
    serialPorts_[{UCase(node), port}] = std::move(device);
}

std::shared_ptr<nodeDB> Runtime::nodes() {
    if (!nodeDB_) nodeDB_ = std::make_shared<nodeDB>();
    return nodeDB_;
}

ClsNodeDBInterface& Runtime::hiddenInterface() {
    if (!hidden_) hidden_ = std::make_unique<ClsNodeDBInterface>();
    return *hidden_;
}

}  // namespace maroset
