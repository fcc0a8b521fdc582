#include "lang/Object.h"

#include "lang/Variant.h"

namespace maroset {

// An object without a default property reads as Empty.
Variant Object::defaultValue() const {
    return Variant();
}

}  // namespace maroset
