#include "gateway/mqtt/SparkplugMetric.h"

#include <limits>

#include "lang/Conversions.h"
#include "lang/VbError.h"

namespace maroset::gateway {

using sparkplug::DataType;

DataType SparkplugMetric::TypeOf(const Variant& value) {
    switch (value.type()) {
        case VarType::Integer: return sparkplug::Int16;
        case VarType::Long: return sparkplug::Int32;
        case VarType::Single: return sparkplug::Float;
        case VarType::Double: return sparkplug::Double;
        case VarType::Boolean: return sparkplug::Boolean;
        default: return sparkplug::String;
    }
}

void SparkplugMetric::Set(Metric& metric, DataType type, const Variant& value) {
    if (value.isEmpty() || value.isNull() || value.isArray() || value.isObject()) {
        metric.set_is_null(true);
        return;
    }
    try {
        switch (type) {
            // Signed integers travel as their two's complement in the 32-bit field.
            case sparkplug::Int16: metric.set_int_value(static_cast<uint32_t>(CInt(value))); break;
            case sparkplug::Int32: metric.set_int_value(static_cast<uint32_t>(CLng(value))); break;
            case sparkplug::Float: metric.set_float_value(CSng(value)); break;
            case sparkplug::Double: metric.set_double_value(CDbl(value)); break;
            case sparkplug::Boolean: metric.set_boolean_value(CBool(value)); break;
            default: metric.set_string_value(CStr(value)); break;
        }
    } catch (const VbError&) {
        metric.set_is_null(true);
    }
}

Variant SparkplugMetric::ValueOf(const Metric& metric) {
    const auto whole = [](double d) -> Variant {
        if (d >= std::numeric_limits<int32_t>::min() && d <= std::numeric_limits<int32_t>::max())
            return Variant(static_cast<int32_t>(d));
        return Variant(d);
    };
    switch (metric.value_case()) {
        case Metric::kIntValue:
            switch (metric.datatype()) {
                case sparkplug::Int8: return Variant(static_cast<int32_t>(static_cast<int8_t>(metric.int_value())));
                case sparkplug::Int16: return Variant(static_cast<int32_t>(static_cast<int16_t>(metric.int_value())));
                case sparkplug::Int32: return Variant(static_cast<int32_t>(metric.int_value()));
                default: return whole(static_cast<double>(metric.int_value()));
            }
        case Metric::kLongValue:
            if (metric.datatype() == sparkplug::Int64)
                return whole(static_cast<double>(static_cast<int64_t>(metric.long_value())));
            return whole(static_cast<double>(metric.long_value()));
        case Metric::kFloatValue: return Variant(metric.float_value());
        case Metric::kDoubleValue: return Variant(metric.double_value());
        case Metric::kBooleanValue: return Variant(metric.boolean_value());
        case Metric::kStringValue: return Variant(metric.string_value());
        default: return Variant::Null();
    }
}

}  // namespace maroset::gateway
