#pragma once

#include <cstdint>

#include "lang/Variant.h"
#include "mqtt/sparkplug_b.pb.h"

namespace maroset::gateway {

// How a tag's Variant travels as a Sparkplug B metric value, both ways.
class SparkplugMetric {
  public:
    using Metric = sparkplug::Payload::Metric;

    // The metric data type of a value's kind: Integer Int16, Long Int32, Single Float, Double
    // Double, Boolean Boolean, String String. A value without a kind of its own (Empty, Null,
    // an array or object) is born as String, so it has a type before its first real value.
    static sparkplug::DataType TypeOf(const Variant& value);
    // Sets the metric's value as `type` carries it; Empty, Null and values that do not
    // convert to the type are sent as null.
    static void Set(Metric& metric, sparkplug::DataType type, const Variant& value);
    // The value a host sent in a command, as the Variant the metric's data type names
    // (Long for integers that fit, Double beyond). Null when it carries none.
    static Variant ValueOf(const Metric& metric);
};

}  // namespace maroset::gateway
