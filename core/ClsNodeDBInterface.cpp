#include "core/ClsNodeDBInterface.h"

#include "core/Procedure.h"
#include "core/Runtime.h"

namespace maroset {

ClsNodeDBInterface::ClsNodeDBInterface() {
    Procedure proc("ClsNodeDBInterface", "Class_Initialize");
    proc.run([&] { nodeDB(Runtime::current().nodes()); });
}

ClsNodeDBInterface::~ClsNodeDBInterface() = default;

void ClsNodeDBInterface::nodeDB(std::shared_ptr<maroset::nodeDB> db) {
    valueChange_.reset();
    driverError_.reset();
    nodeDB_ = std::move(db);
    if (!nodeDB_) return;
    valueChange_ = nodeDB_->ValueChange.subscribe(
        [this](VbArray<int32_t>& ids, int16_t n, VbArray<Variant>& values) {
            nodeDB_valuechange(ids, n, values);
        });
    driverError_ = nodeDB_->DriverError.subscribe(
        [this](const std::string& driver, const std::string& from, const std::string& message) {
            nodeDB_DriverError(driver, from, message);
        });
}

void ClsNodeDBInterface::nodeDB_valuechange(VbArray<int32_t>& TagIDs, int16_t NumItems,
                                            VbArray<Variant>& Values) {
    Procedure proc("ClsNodeDBInterface", "nodeDB_valuechange");
    proc.run([&] { ValueChange.raise(TagIDs, NumItems, Values); });
}

void ClsNodeDBInterface::nodeDB_DriverError(const std::string& Driver, const std::string& FromSub,
                                            const std::string& Message) {
    Procedure proc("ClsNodeDBInterface", "nodeDB_DriverError");
    proc.run([&] { DriverError.raise(Driver, FromSub, Message); });
}

}  // namespace maroset
