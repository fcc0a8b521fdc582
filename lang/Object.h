#pragma once

namespace maroset {

class Variant;

// An object a Variant can refer to. Assigning an object to a value property takes its
// default value, as the system's properties do.
class Object {
  public:
    virtual ~Object() = default;
    virtual Variant defaultValue() const;
};

}  // namespace maroset
