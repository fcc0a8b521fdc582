#include "gateway/JsonValue.h"

namespace maroset::gateway {

const JsonValue* JsonValue::member(std::string_view name) const {
    const JsonValue* found = nullptr;
    for (size_t i = 0; i < names.size(); ++i) {
        if (names[i] == name) found = &values[i];
    }
    return found;
}

}  // namespace maroset::gateway
