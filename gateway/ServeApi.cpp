#include "gateway/ServeApi.h"

#include <charconv>

#include "core/LinkStatusBoard.h"
#include "core/nodeDB.h"
#include "gateway/JsonReader.h"
#include "gateway/LinkStatusJson.h"
#include "gateway/PrometheusText.h"
#include "gateway/WebAssets.h"
#include "gateway/mqtt/MqttPublisher.h"
#include "lang/VbError.h"

namespace maroset::gateway {

namespace {

// Token comparison whose time does not depend on where the first difference is.
bool sameSecret(std::string_view a, std::string_view b) {
    unsigned char diff = a.size() == b.size() ? 0 : 1;
    for (size_t i = 0; i < a.size(); ++i)
        diff |= static_cast<unsigned char>(a[i] ^ (i < b.size() ? b[i] : 0));
    return diff == 0;
}

}  // namespace

ServeApi::ServeApi(nodeDB& db, LinkStatusBoard& links, TagBook& tags, EventStream& events,
                   WritePolicy writes)
    : db_(db), links_(links), tags_(tags), events_(events), writes_(std::move(writes)) {}

HttpResponse ServeApi::handle(const HttpRequest& request) {
    const std::string_view path = request.path;
    const bool get = request.method == "GET" || request.method == "HEAD";
    auto only = [&](bool allowed, auto&& answer) {
        return allowed ? answer() : HttpResponse::Error(405, "method not allowed");
    };
    constexpr std::string_view tagPrefix = "/api/tags/";
    if (path == "/api/nodes") return only(get, [&] { return nodes(); });
    if (path == "/api/tags") return only(get, [&] { return tags(); });
    if (path == "/api/info") return only(get, [&] { return info(); });
    if (path.starts_with(tagPrefix)) {
        return only(request.method == "POST",
                    [&] { return write(request, path.substr(tagPrefix.size())); });
    }
    if (path == "/api/events") {
        return only(get, [&] {
            return HttpResponse{200, "text/event-stream", {}, events_.connect()};
        });
    }
    if (path == "/metrics") {
        return only(get, [&] {
            std::string text = PrometheusText::Render(links_.All());
            if (mqtt_) text += mqtt_->status().prometheus();
            return HttpResponse{200, "text/plain; version=0.0.4; charset=utf-8", std::move(text),
                                nullptr};
        });
    }
    if (const WebAssets::File* file = WebAssets::Find(path)) {
        return only(get, [&] {
            return HttpResponse{200, std::string(file->contentType), std::string(file->bytes),
                                nullptr};
        });
    }
    return HttpResponse::Error(404, "no such path");
}

HttpResponse ServeApi::nodes() const {
    JsonWriter j;
    j.beginArray();
    for (const LinkStatus& s : links_.All()) LinkStatusJson::Write(j, s);
    if (mqtt_) mqtt_->status().writeJson(j);
    return HttpResponse::Json(j.endArray().str());
}

HttpResponse ServeApi::info() const {
    JsonWriter j;
    j.beginObject().key("writes").boolean(writes_.allowed);
    j.key("token").boolean(writes_.allowed && !writes_.token.empty());
    return HttpResponse::Json(j.endObject().str());
}

HttpResponse ServeApi::tags() const {
    JsonWriter j;
    j.beginArray();
    for (const TagBook::Tag& t : tags_.tags()) {
        j.beginObject().key("node").string(t.row.node).key("handle").integer(t.row.handle);
        j.key("address").string(t.row.address).key("name").string(t.row.name);
        j.key("value").value(t.value).key("type").string(t.value.typeName());
        j.key("time");
        if (t.time)
            j.time(*t.time);
        else
            j.null();
        j.key("changes").integer(static_cast<int64_t>(t.changes)).endObject();
    }
    return HttpResponse::Json(j.endArray().str());
}

HttpResponse ServeApi::write(const HttpRequest& request, std::string_view target) {
    if (!writes_.allowed) return HttpResponse::Error(403, "writes are not allowed");
    if (!writes_.token.empty() && !sameSecret(request.authorization, "Bearer " + writes_.token))
        return HttpResponse::Error(401, "a write needs Authorization: Bearer TOKEN");

    const size_t slash = target.rfind('/');
    int32_t handle = 0;
    const std::string_view handleText =
        slash == std::string_view::npos ? std::string_view() : target.substr(slash + 1);
    const auto [end, ec] =
        std::from_chars(handleText.data(), handleText.data() + handleText.size(), handle);
    if (slash == std::string_view::npos || slash == 0 || ec != std::errc() ||
        end != handleText.data() + handleText.size())
        return HttpResponse::Error(404, "no such tag: the path is /api/tags/NODE/HANDLE");
    const std::string nodeName(target.substr(0, slash));
    const TagBook::Tag* tag = tags_.find(nodeName, handle);
    const auto n = db_.getNode(nodeName);
    if (!n) return HttpResponse::Error(404, "no node named '" + nodeName + "'");
    if (!tag)
        return HttpResponse::Error(404, "no tag " + std::to_string(handle) + " on " + nodeName);

    Variant value;
    bool isArray = false;
    VbArray<Variant> items;
    try {
        const JsonValue body = JsonReader::Parse(request.body);
        const JsonValue* v = body.member("value");
        if (body.kind != JsonValue::Kind::Object || !v)
            return HttpResponse::Error(400, "the body must be {\"value\": V}");
        if (v->kind == JsonValue::Kind::Array) {
            std::vector<Variant> list;
            for (const JsonValue& item : v->items) list.push_back(JsonReader::ToVariant(item));
            if (list.empty()) return HttpResponse::Error(400, "an array to write is empty");
            items = VbArray<Variant>(0, std::move(list));
            isArray = true;
        } else {
            value = JsonReader::ToVariant(*v);
        }
    } catch (const JsonReader::Error& e) {
        return HttpResponse::Error(400, std::string("malformed JSON: ") + e.what());
    }

    JsonWriter j;
    try {
        // The handle travels as text, as a host passes it; the node converts it.
        if (isArray)
            n->WriteArray(std::to_string(handle), items);
        else
            n->WriteTag(std::to_string(handle), value);
        j.beginObject().key("ok").boolean(true).endObject();
    } catch (const VbError& e) {
        j.beginObject().key("ok").boolean(false).key("error").beginObject();
        j.key("number").integer(e.number()).key("description").string(e.description());
        j.endObject().endObject();
    }
    return HttpResponse::Json(j.str());
}

}  // namespace maroset::gateway
