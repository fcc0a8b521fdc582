#include "gateway/HttpResponse.h"

#include "gateway/JsonWriter.h"

namespace maroset::gateway {

HttpResponse HttpResponse::Error(int status, std::string_view message) {
    JsonWriter j;
    j.beginObject().key("ok").boolean(false).key("error").beginObject();
    j.key("status").integer(status).key("message").string(message).endObject().endObject();
    return Json(j.str(), status);
}

}  // namespace maroset::gateway
