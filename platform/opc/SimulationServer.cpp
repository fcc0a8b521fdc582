#include "platform/opc/SimulationServer.h"

#include <chrono>
#include <limits>

#include "platform/opc/OpcErrors.h"

namespace maroset::platform {

namespace {

using std::chrono::milliseconds;

bool startsWith(const std::string& s, const char* prefix) {
    return s.rfind(prefix, 0) == 0;
}

// A Ramp item: its value is the whole seconds since it was added, worked out when read.
class RampItem final : public OpcItemSource {
  public:
    RampItem(const EventLoop& loop, const Clock& clock)
        : loop_(loop), started_(loop.now()), startedAt_(clock.now()) {}

    OpcItemState Read() override {
        const int64_t seconds = (loop_.now() - started_) / milliseconds(1000);
        const int32_t value =
            static_cast<int32_t>(std::min<int64_t>(seconds, std::numeric_limits<int32_t>::max()));
        return {Variant(value), opc::OPC_QUALITY_GOOD, startedAt_ + milliseconds(1000) * value};
    }
    bool Writable() const override { return false; }
    int32_t Write(const Variant&) override { return opc::OPC_E_BADRIGHTS; }

  private:
    const EventLoop& loop_;
    EventLoop::Duration started_;
    DateTime startedAt_;
};

// A Static item: a view of the server's one value of its item ID.
class StaticItem final : public OpcItemSource {
  public:
    StaticItem(std::shared_ptr<OpcItemState> cell, const Clock& clock)
        : cell_(std::move(cell)), clock_(clock) {}

    OpcItemState Read() override { return *cell_; }
    bool Writable() const override { return true; }
    int32_t Write(const Variant& value) override {
        cell_->value = value;
        cell_->timeStamp = clock_.now();
        return opc::S_OK;
    }

  private:
    std::shared_ptr<OpcItemState> cell_;
    const Clock& clock_;
};

}  // namespace

SimulationServer::SimulationServer(const EventLoop& loop, const Clock& clock)
    : loop_(loop), clock_(clock) {}

SimulationServer::~SimulationServer() = default;

std::string SimulationServer::VendorInfo() const {
    return "Maroset simulated OPC server (Static.* and Ramp.* items)";
}

std::shared_ptr<OpcItemState> SimulationServer::cell(const std::string& itemID) {
    auto& slot = statics_[itemID];
    if (!slot) {
        slot = std::make_shared<OpcItemState>(
            OpcItemState{Variant(int32_t{0}), opc::OPC_QUALITY_GOOD, clock_.now()});
    }
    return slot;
}

int32_t SimulationServer::AddItem(const std::string& itemID, std::shared_ptr<OpcItemSource>& item) {
    if (startsWith(itemID, StaticPrefix)) {
        item = std::make_shared<StaticItem>(cell(itemID), clock_);
        return opc::S_OK;
    }
    if (startsWith(itemID, RampPrefix)) {
        item = std::make_shared<RampItem>(loop_, clock_);
        return opc::S_OK;
    }
    item.reset();
    return opc::OPC_E_UNKNOWNITEMID;
}

std::optional<Variant> SimulationServer::StaticValue(const std::string& itemID) const {
    const auto it = statics_.find(itemID);
    if (it == statics_.end()) return std::nullopt;
    return it->second->value;
}

void SimulationServer::SetStatic(const std::string& itemID, const Variant& value) {
    const auto c = cell(itemID);
    c->value = value;
    c->timeStamp = clock_.now();
}

}  // namespace maroset::platform
