#include "platform/tcp/TcpErrors.h"

#include <netdb.h>

#include <cerrno>

#include "lang/VbError.h"

namespace maroset::platform::sck {

std::string Description(int32_t number) {
    switch (number) {
        case InvalidPropertyValue:
            return "Invalid property value";
        case AddressInUse:
            return "Address in use";
        case AddressNotAvailable:
            return "Address not available from the local machine";
        case NetworkSubsystemFailed:
            return "Network subsystem failed";
        case NetworkUnreachable:
            return "The network cannot be reached from this host at this time";
        case ConnectAborted:
            return "Connection is aborted due to timeout or other failure";
        case ConnectionReset:
            return "The connection is reset by remote side";
        case NoBufferSpace:
            return "No buffer space is available";
        case NotConnected:
            return "Socket is not connected";
        case Timedout:
            return "Attempt to connect timed out";
        case ConnectionRefused:
            return "Connection is forcefully rejected";
        case HostNotFound:
            return "Authoritative answer: Host not found";
        case HostNotFoundTryAgain:
            return "Non-Authoritative answer: Host not found";
        case NonRecoverableError:
            return "Non-recoverable errors";
        case NoData:
            return "Valid name, no data record of requested type";
        case BadState:
            return "Wrong protocol or connection state for the requested transaction or request";
        case InvalidOp:
            return "Invalid operation at current state";
        default:
            return ErrorDescription(number);
    }
}

int32_t FromErrno(int error) {
    switch (error) {
        case ECONNREFUSED:
            return ConnectionRefused;
        case ETIMEDOUT:
            return Timedout;
        case ECONNRESET:
        case EPIPE:
            return ConnectionReset;
        case ENETUNREACH:
        case EHOSTUNREACH:
        case EHOSTDOWN:
            return NetworkUnreachable;
        case ECONNABORTED:
            return ConnectAborted;
        case EADDRNOTAVAIL:
        case EAFNOSUPPORT:
            return AddressNotAvailable;
        case EADDRINUSE:
            return AddressInUse;
        case ENOBUFS:
        case ENOMEM:
        case EMFILE:
        case ENFILE:
            return NoBufferSpace;
        case ENOTCONN:
            return NotConnected;
        default:
            return NetworkSubsystemFailed;
    }
}

int32_t FromResolver(int gaiError) {
    switch (gaiError) {
        case EAI_NONAME:
            return HostNotFound;
        case EAI_AGAIN:
            return HostNotFoundTryAgain;
#ifdef EAI_NODATA
        case EAI_NODATA:
#endif
#ifdef EAI_ADDRFAMILY
        case EAI_ADDRFAMILY:
#endif
            return NoData;
        default:
            return NonRecoverableError;
    }
}

}  // namespace maroset::platform::sck
