#include "platform/mbt/MbtStatus.h"

namespace maroset::platform::mbt {

std::string StatusText(int32_t status) {
    switch (status) {
        case Ok:
            return "Success";
        case IllegalFunction:
            return "Illegal function";
        case IllegalDataAddress:
            return "Illegal data address";
        case IllegalDataValue:
            return "Illegal data value";
        case ServerDeviceFailure:
            return "Server device failure";
        case Acknowledge:
            return "Acknowledge";
        case ServerDeviceBusy:
            return "Server device busy";
        case MemoryParityError:
            return "Memory parity error";
        case GatewayPathUnavailable:
            return "Gateway path unavailable";
        case GatewayTargetFailed:
            return "Gateway target device failed to respond";
        case NotInitialised:
            return "MBTInit has not been called";
        case InvalidArgument:
            return "Invalid argument";
        case InvalidHandle:
            return "No connection with this handle";
        case NotSupported:
            return "Not supported";
        case ConnectFailed:
            return "Could not connect to the coupler";
        case Timeout:
            return "No reply within the time-out";
        case ConnectionClosed:
            return "Connection closed";
        case BadReply:
            return "Reply does not answer the request";
        case LinkError:
            return "Link error";
        default:
            break;
    }
    if (status > 0 && status <= 0xFF) return "Modbus exception " + std::to_string(status);
    return "Status " + std::to_string(status);
}

}  // namespace maroset::platform::mbt
