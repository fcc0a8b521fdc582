#include "core/Object.h"

#include "core/Variant.h"

namespace maroset {

// An object without a default property reads as Empty.
Variant Object::defaultValue() const {
    return Variant();
}

}  // namespace maroset
