#include "platform/opc/OpcErrors.h"

#include <cstdio>

namespace maroset::platform::opc {

std::optional<std::string> StandardErrorText(int32_t code) {
    const char* text = nullptr;
    switch (code) {
        case S_OK:
            text = "The operation completed successfully.";
            break;
        case OPC_E_INVALIDHANDLE:
            text = "The value of the handle is invalid.";
            break;
        case OPC_E_BADTYPE:
            text =
                "The server cannot convert the data between the specified format and/or "
                "requested data type and the canonical data type.";
            break;
        case OPC_E_PUBLIC:
            text = "The requested operation cannot be done on a public group.";
            break;
        case OPC_E_BADRIGHTS:
            text = "The item's access rights do not allow the operation.";
            break;
        case OPC_E_UNKNOWNITEMID:
            text =
                "The item ID is not defined in the server address space or no longer exists in "
                "the server address space.";
            break;
        case OPC_E_INVALIDITEMID:
            text = "The item ID does not conform to the server's syntax.";
            break;
        case OPC_E_INVALIDFILTER:
            text = "The filter string was not valid.";
            break;
        case OPC_E_UNKNOWNPATH:
            text = "The item's access path is not known to the server.";
            break;
        case OPC_E_RANGE:
            text = "The value was out of range.";
            break;
        case OPC_E_DUPLICATENAME:
            text = "Duplicate name not allowed.";
            break;
        case OPC_S_UNSUPPORTEDRATE:
            text =
                "The server does not support the requested data rate but will use the closest "
                "available rate.";
            break;
        case OPC_S_CLAMP:
            text = "A value passed to write was accepted but the output was clamped.";
            break;
        case OPC_E_INVALIDCONFIGFILE:
            text = "The server's configuration file is an invalid format.";
            break;
        case OPC_E_NOTFOUND:
            text = "The requested object (e.g. a public group) was not found.";
            break;
        case OPC_E_INVALID_PID:
            text = "The specified property ID is not valid for the item.";
            break;
        case E_FAIL:
            text = "Unspecified error";
            break;
        case E_INVALIDARG:
            text = "The parameter is incorrect.";
            break;
        case CO_E_CLASSSTRING:
            text = "Invalid class string";
            break;
        default:
            return std::nullopt;
    }
    // The message table's line end comes with every text.
    return std::string(text) + "\r\n";
}

std::string HexCode(int32_t code) {
    char buffer[16];
    std::snprintf(buffer, sizeof buffer, "0x%08X", static_cast<uint32_t>(code));
    return buffer;
}

VbError Failure(int32_t code, std::string source, std::string description) {
    if (description.empty()) {
        if (auto text = StandardErrorText(code)) {
            description = text->substr(0, text->size() - 2);
        } else {
            description = "Automation error " + HexCode(code);
        }
    }
    return VbError(code, std::move(description), std::move(source));
}

}  // namespace maroset::platform::opc
