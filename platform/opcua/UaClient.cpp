#include "platform/opcua/UaClient.h"

#include <algorithm>
#include <charconv>

#include "lang/Strings.h"
#include "platform/opcua/UaServices.h"

namespace maroset::platform::opcua {

namespace {

constexpr uint32_t ReceiveBufferSize = 65536;
constexpr uint32_t SendBufferSize = 65536;
constexpr uint32_t MaxMessageSize = 16 * 1024 * 1024;
constexpr uint32_t NamespaceArray = 2255;
constexpr double SessionTimeoutMs = 60000;
constexpr uint32_t MessageSecurityModeNone = 1;
constexpr uint32_t ApplicationTypeClient = 1;
constexpr uint32_t UserTokenAnonymous = 0;
constexpr uint32_t BadConnectionClosed = 0x80AE0000;

uint32_t serviceResult(const std::vector<Value>& v) {
    return v.size() > 2 ? static_cast<uint32_t>(v[2].number) : status::BadCommunicationError;
}

// A status that means the session or the channel is gone, whichever call it answers.
bool sessionLost(uint32_t s) {
    const uint32_t k = s & 0xFFFF0000u;
    return k == status::BadSessionIdInvalid || k == status::BadSessionClosed ||
           k == 0x80270000 /* BadSessionNotActivated */ || k == 0x80220000 /* channel id */ ||
           k == status::BadSecureChannelClosed || k == 0x80870000 /* token unknown */;
}

}  // namespace

bool EndpointUrl::Parse(const std::string& url, EndpointUrl& out) {
    constexpr std::string_view scheme = "opc.tcp://";
    if (url.size() <= scheme.size() || UCase(url.substr(0, scheme.size())) != UCase(scheme))
        return false;
    std::string_view rest = std::string_view(url).substr(scheme.size());
    rest = rest.substr(0, rest.find('/'));
    std::string_view host = rest;
    int32_t port = DefaultPort;
    if (!rest.empty() && rest.front() == '[') {
        const size_t close = rest.find(']');
        if (close == std::string_view::npos) return false;
        host = rest.substr(1, close - 1);
        rest = rest.substr(close + 1);
        if (!rest.empty() && rest.front() != ':') return false;
        if (!rest.empty())
            rest = rest.substr(1);
        else
            rest = {};
        if (!rest.empty() || url.find("]:") != std::string::npos) {
            const auto [p, ec] = std::from_chars(rest.data(), rest.data() + rest.size(), port);
            if (ec != std::errc() || p != rest.data() + rest.size()) return false;
        }
    } else if (const size_t colon = rest.find(':'); colon != std::string_view::npos) {
        host = rest.substr(0, colon);
        const std::string_view p = rest.substr(colon + 1);
        const auto [end, ec] = std::from_chars(p.data(), p.data() + p.size(), port);
        if (ec != std::errc() || end != p.data() + p.size()) return false;
    }
    if (host.empty() || port < 1 || port > 65535) return false;
    out.host = std::string(host);
    out.port = port;
    return true;
}

const char* UaClient::StateName(State s) {
    switch (s) {
        case State::Idle:
            return "idle";
        case State::Connecting:
            return "connecting";
        case State::Hello:
            return "hello";
        case State::Channel:
            return "channel";
        case State::Session:
            return "session";
        case State::Active:
            return "active";
        case State::Backoff:
            return "backoff";
    }
    return "?";
}

UaClient::UaClient(EventLoop& loop, TcpNetwork& network, Options options, Handlers handlers)
    : loop_(loop),
      network_(network),
      options_(std::move(options)),
      handlers_(std::move(handlers)),
      retryDelay_(options_.firstRetry) {
    endpointValid_ = EndpointUrl::Parse(options_.endpointUrl, endpoint_);
}

UaClient::~UaClient() {
    *alive_ = false;
    closeStream();
    if (retryTimer_) loop_.cancel(*retryTimer_);
    for (auto& [handle, p] : pending_) loop_.cancel(p.timer);
}

void UaClient::enter(State s) {
    if (s == state_) return;
    state_ = s;
    if (handlers_.stateChanged) handlers_.stateChanged(s);
}

void UaClient::start() {
    if (state_ == State::Idle) connect();
}

void UaClient::stop() {
    if (retryTimer_) loop_.cancel(*retryTimer_);
    retryTimer_.reset();
    if (state_ == State::Active && stream_) {
        // Said politely; the server forgets the session when the channel goes anyway.
        send(
            msg::CloseSessionRequest, [](std::vector<Value>& v) { AddNumber(v, 1); }, nextHandle_++,
            0);
    }
    closeStream();
    enter(State::Idle);
    failAll(status::BadNotConnected);
    retryDelay_ = options_.firstRetry;
}

void UaClient::connect() {
    if (!endpointValid_) {
        enter(State::Backoff);
        fail("the endpoint URL is not opc.tcp://HOST[:PORT][/PATH]", 0x80830000);
        return;
    }
    enter(State::Connecting);
    assembler_.reset();
    assembler_.setLimits({ReceiveBufferSize, MaxMessageSize, 0});
    const std::weak_ptr<bool> alive = alive_;
    stepTimer_ = loop_.schedule(options_.connectTimeout, [this, alive] {
        if (alive.expired()) return;
        stepTimer_.reset();
        fail(std::string("no session within ") +
                 std::to_string(options_.connectTimeout.count() / 1000) + " s (stuck in " +
                 StateName(state_) + ")",
             status::BadTimeout);
    });
    stream_ = network_.connect(endpoint_.host, endpoint_.port);
    TcpStream::Handlers h;
    h.connected = [this, alive] {
        if (!alive.expired()) sendHello();
    };
    h.received = [this, alive](std::string_view bytes) {
        if (!alive.expired()) received(bytes);
    };
    h.closed = [this, alive] {
        if (!alive.expired()) fail("the server closed the connection", BadConnectionClosed);
    };
    h.failed = [this, alive](int32_t number, const std::string& description) {
        if (alive.expired()) return;
        fail("connection failed: " + description + " (" + std::to_string(number) + ")",
             status::BadNotConnected);
    };
    stream_->listen(std::move(h));
}

void UaClient::closeStream() {
    for (auto* t : {&stepTimer_, &renewTimer_, &silenceTimer_}) {
        if (*t) loop_.cancel(**t);
        t->reset();
    }
    if (stream_) {
        stream_->close();
        stream_.reset();
    }
    assembler_.reset();
    publishOut_ = 0;
    acks_.clear();
    channelId_ = 0;
    tokenId_ = 0;
    authenticationToken_ = NodeId{};
}

void UaClient::fail(const std::string& text, uint32_t status) {
    if (state_ == State::Idle) return;
    const bool wasDown = state_ == State::Backoff;
    const std::weak_ptr<bool> alive = alive_;
    closeStream();
    if (!wasDown) {
        ++failures_;
        enter(State::Backoff);
        if (alive.expired()) return;
        if (handlers_.incident) handlers_.incident(text, status);
        if (alive.expired()) return;
        failAll(status::BadNotConnected);
        if (alive.expired() || state_ != State::Backoff) return;
    }
    if (retryTimer_) loop_.cancel(*retryTimer_);
    const auto delay = retryDelay_;
    retryDelay_ = std::min(retryDelay_ * 2, options_.longestRetry);
    retryTimer_ = loop_.schedule(delay, [this, alive] {
        if (alive.expired()) return;
        retryTimer_.reset();
        if (state_ == State::Backoff) connect();
    });
}

void UaClient::failAll(uint32_t status) {
    const std::weak_ptr<bool> alive = alive_;
    auto pending = std::move(pending_);
    pending_.clear();
    std::vector<Value> none;
    for (auto& [handle, p] : pending) {
        loop_.cancel(p.timer);
        if (p.publish) continue;
        p.done(status, none);
        if (alive.expired()) return;
    }
}

void UaClient::received(std::string_view bytes) {
    const std::weak_ptr<bool> alive = alive_;
    try {
        assembler_.feed(bytes, [this](const UaMessage& m) { onMessage(m); });
    } catch (const DecodeError& e) {
        if (!alive.expired()) fail(std::string("undecodable message: ") + e.what(), 0x80070000);
        return;
    }
    if (!alive.expired() && state_ == State::Active) armSilence();
}

void UaClient::armSilence() {
    if (silenceTimer_) loop_.cancel(*silenceTimer_);
    silenceTimer_.reset();
    if (pending_.empty()) return;
    const std::weak_ptr<bool> alive = alive_;
    silenceTimer_ = loop_.schedule(options_.silence, [this, alive] {
        if (alive.expired()) return;
        silenceTimer_.reset();
        fail("the server stopped answering", status::BadTimeout);
    });
}

void UaClient::sendHello() {
    enter(State::Hello);
    out_.clear();
    Writer w(out_);
    out_.append("HELF");
    w.u32(0);  // size, patched below
    w.u32(0);  // protocol version
    w.u32(ReceiveBufferSize);
    w.u32(SendBufferSize);
    w.u32(MaxMessageSize);
    w.u32(0);  // chunk count: no limit
    w.bytes(options_.endpointUrl);
    w.patch32(4, static_cast<uint32_t>(out_.size()));
    stream_->write(out_);
}

void UaClient::onMessage(const UaMessage& m) {
    const std::string_view type(m.type, 3);
    if (m.aborted) {
        std::vector<Value> none;
        respond(m.requestId, m.status, none);
        return;
    }
    if (type == "ERR") {
        Reader r(m.body);
        const uint32_t s = r.u32();
        const std::string reason(r.left() >= 4 ? r.bytes() : std::string_view());
        fail(std::string("the server refused the connection") + (reason.empty() ? "" : ": ") +
                 reason,
             s);
        return;
    }
    if (type == "ACK") {
        if (state_ != State::Hello) return;
        Reader r(m.body);
        (void)r.u32();  // protocol version
        const uint32_t serverReceive = r.u32();
        const uint32_t serverSend = r.u32();
        if (serverReceive < 8192 || serverSend > ReceiveBufferSize)
            throw DecodeError("buffer sizes outside what UA TCP allows");
        sendChunkSize_ = std::min(SendBufferSize, serverReceive);
        openChannel(false);
        return;
    }
    if (type == "OPN") {
        onChannel(m);
        return;
    }
    if (type != "MSG") return;  // CLO: the channel goes with the connection
    Reader r(m.body);
    NodeId typeId;
    r.nodeId(typeId);
    const auto it = pending_.find(m.requestId);
    if (it == pending_.end()) return;  // timed out meanwhile
    Pending p = std::move(it->second);
    pending_.erase(it);
    loop_.cancel(p.timer);
    std::vector<Value> local;
    std::vector<Value>& values = p.publish ? notes_ : local;
    uint32_t s;
    if (typeId.ns == 0 && typeId.numeric == id::ServiceFault) {
        Decode(r, msg::ServiceFault, values);
        s = serviceResult(values);
        values.clear();
    } else if (typeId.ns == 0 && typeId.numeric == p.responseId) {
        Decode(r, *p.response, values);
        s = serviceResult(values);
    } else {
        throw DecodeError("a response of another type than its request's");
    }
    if (sessionLost(s) && state_ == State::Active) {
        fail("the server lost the session", s);
        return;
    }
    if (p.publish) {
        onPublish(s, values);
    } else {
        p.done(s, values);
    }
}

void UaClient::openChannel(bool renew) {
    if (!renew) enter(State::Channel);
    std::vector<Value> v;
    AppendRequestHeader(v, NodeId{}, ticksNow(), nextHandle_++, 0);
    AddNumber(v, 0);  // protocol version
    AddNumber(v, renew ? 1 : 0);
    AddNumber(v, MessageSecurityModeNone);
    AddNull(v);  // client nonce
    AddNumber(v, static_cast<uint64_t>(options_.channelLifetime.count()));
    body_.clear();
    Writer w(body_);
    w.nodeId(NodeId::Numeric(msg::OpenSecureChannelRequest.encodingId));
    Encode(w, msg::OpenSecureChannelRequest, v);
    out_.clear();
    WriteChunks(out_, "OPN", channelId_, 0, sequence_, nextRequestId_++, body_, sendChunkSize_);
    stream_->write(out_);
}

void UaClient::onChannel(const UaMessage& m) {
    Reader r(m.body);
    NodeId typeId;
    r.nodeId(typeId);
    std::vector<Value> v;
    if (typeId.numeric == id::ServiceFault) {
        Decode(r, msg::ServiceFault, v);
        fail("the server refused the secure channel", serviceResult(v));
        return;
    }
    if (typeId.numeric != id::OpenSecureChannelResponse) throw DecodeError("OPN of another type");
    Decode(r, msg::OpenSecureChannelResponse, v);
    const uint32_t s = serviceResult(v);
    if (IsBad(s)) {
        fail("the server refused the secure channel", s);
        return;
    }
    const size_t i = AfterHeader(v);
    if (v.size() < i + 6) throw DecodeError("short OpenSecureChannelResponse");
    channelId_ = static_cast<uint32_t>(v[i + 1].number);
    tokenId_ = static_cast<uint32_t>(v[i + 2].number);
    auto lifetime = std::chrono::milliseconds(v[i + 4].number);
    if (lifetime.count() <= 0 || lifetime > options_.channelLifetime)
        lifetime = options_.channelLifetime;
    // Renewed at three quarters of its lifetime, so the old token still holds meanwhile.
    if (renewTimer_) loop_.cancel(*renewTimer_);
    const std::weak_ptr<bool> alive = alive_;
    renewTimer_ = loop_.schedule(lifetime * 3 / 4, [this, alive] {
        if (alive.expired()) return;
        renewTimer_.reset();
        if (stream_) openChannel(true);
    });
    if (state_ == State::Channel) createSession();
}

void UaClient::send(const StructType& request, const Fill& fill, uint32_t handle,
                    uint32_t timeoutMs) {
    std::vector<Value> v;
    v.reserve(16);
    AppendRequestHeader(v, authenticationToken_, ticksNow(), handle, timeoutMs);
    fill(v);
    std::string body;
    Writer w(body);
    w.nodeId(NodeId::Numeric(request.encodingId));
    Encode(w, request, v);
    out_.clear();
    WriteChunks(out_, "MSG", channelId_, tokenId_, sequence_, handle, body, sendChunkSize_);
    stream_->write(out_);
}

void UaClient::createSession() {
    enter(State::Session);
    const std::weak_ptr<bool> alive = alive_;
    Done done = ([this](uint32_t s, std::vector<Value>& v) {
        if (state_ != State::Session) return;
        if (IsBad(s) || v.empty()) {
            fail("the server refused the session", s ? s : status::BadTimeout);
            return;
        }
        const size_t i = AfterHeader(v);
        authenticationToken_ = v.at(i + 1).node;
        // The endpoints: is there one with security None, and its anonymous policy?
        size_t at = i + 5;
        const uint32_t endpoints = v.at(at++).count;
        bool none = false;
        std::optional<std::string> anonymous;
        for (uint32_t e = 0; e < endpoints; ++e) {
            ++at;                      // endpointUrl
            at += 6;                   // application description up to its urls
            at += 1 + v.at(at).count;  // discoveryUrls
            ++at;                      // serverCertificate
            const auto mode = v.at(at++).number;
            const std::string_view policy = v.at(at++).text;
            const uint32_t tokens = v.at(at++).count;
            const bool isNone = mode == MessageSecurityModeNone && policy == SecurityPolicyNone;
            none = none || isNone;
            for (uint32_t t = 0; t < tokens; ++t) {
                if (isNone && v.at(at + 1).number == UserTokenAnonymous && !anonymous)
                    anonymous = std::string(v.at(at).text);
                at += 5;
            }
            at += 2;  // transportProfileUri, securityLevel
        }
        if (!none) {
            fail("the server offers no endpoint with security None (only None is supported)",
                 status::BadSecurityPolicyRejected);
            return;
        }
        if (!anonymous) {
            fail("the server's None endpoint takes no anonymous user", 0x80210000);
            return;
        }
        activateSession(*anonymous);
    });
    const std::string& url = options_.endpointUrl;
    request(
        msg::CreateSessionRequest, msg::CreateSessionResponse,
        [&url](std::vector<Value>& v) {
            AddText(v, "urn:maroset:opcua-client");
            AddText(v, "urn:maroset");
            AddText(v, "Maroset");
            AddNumber(v, ApplicationTypeClient);
            AddNull(v);
            AddNull(v);
            AddLength(v, 0);
            AddNull(v);  // serverUri
            AddText(v, url);
            AddText(v, "Maroset");
            AddNull(v);  // nonce: nothing is signed
            AddNull(v);  // certificate
            AddValue(v).real = SessionTimeoutMs;
            AddNumber(v, MaxMessageSize);
        },
        std::move(done));
}

void UaClient::activateSession(const std::string& policyId) {
    auto token = std::make_shared<std::string>();
    {
        Writer w(*token);
        w.bytes(policyId);
    }
    const std::weak_ptr<bool> alive = alive_;
    Done done = ([this](uint32_t s, std::vector<Value>& v) {
        if (state_ != State::Session) return;
        if (IsBad(s) || v.empty()) {
            fail("the server refused the anonymous session", s ? s : status::BadTimeout);
            return;
        }
        readNamespaces();
    });
    request(
        msg::ActivateSessionRequest, msg::ActivateSessionResponse,
        [&token](std::vector<Value>& v) {
            AddNull(v);
            AddNull(v);  // client signature
            AddLength(v, 0);
            AddLength(v, 0);
            Value& t = AddValue(v);
            t.node = NodeId::Numeric(msg::AnonymousIdentityToken.encodingId);
            t.number = 1;
            t.text = *token;
            AddNull(v);
            AddNull(v);  // token signature
        },
        std::move(done));
}

void UaClient::readNamespaces() {
    const std::weak_ptr<bool> alive = alive_;
    Done done = ([this, alive](uint32_t s, std::vector<Value>& v) {
        if (state_ != State::Session) return;
        namespaces_.clear();
        const size_t i = AfterHeader(v);
        if (!IsBad(s) && v.size() > i + 1 && v[i].count == 1 && v[i + 1].data.value.isArray()) {
            for (const Variant& e : v[i + 1].data.value.array())
                namespaces_.push_back(e.isString() ? e.string() : std::string());
        }
        if (stepTimer_) loop_.cancel(*stepTimer_);
        stepTimer_.reset();
        failures_ = 0;
        retryDelay_ = options_.firstRetry;
        enter(State::Active);
        if (alive.expired()) return;
        topUpPublish();
    });
    request(
        msg::ReadRequest, msg::ReadResponse,
        [](std::vector<Value>& v) {
            AddValue(v).real = 0;
            AddNumber(v, 3);  // no time stamps
            AddLength(v, 1);
            AddValue(v).node = NodeId::Numeric(NamespaceArray);
            AddNumber(v, 13);
            AddNull(v);
            AddNull(v);
        },
        std::move(done));
}

void UaClient::respond(uint32_t handle, uint32_t status, std::vector<Value>& values) {
    const auto it = pending_.find(handle);
    if (it == pending_.end()) return;
    Pending p = std::move(it->second);
    pending_.erase(it);
    loop_.cancel(p.timer);
    const std::weak_ptr<bool> alive = alive_;
    if (p.publish) {
        onPublish(status, values);
        return;
    }
    p.done(status, values);
    // A call the server never answered: the server is as good as gone.
    if (!alive.expired() && status == status::BadTimeout && state_ == State::Active)
        fail("no answer to a service call within " + std::to_string(options_.callTimeout.count()) +
                 " ms",
             status::BadTimeout);
    else if (!alive.expired() && status == status::BadTimeout && state_ != State::Backoff &&
             state_ != State::Idle)
        fail(std::string("no answer while opening the session (") + StateName(state_) + ")",
             status::BadTimeout);
}

void UaClient::call(const StructType& type, const StructType& response, const Fill& fill,
                    Done done) {
    if (state_ != State::Active) {
        const std::weak_ptr<bool> alive = alive_;
        loop_.post([alive, done = std::move(done)] {
            if (alive.expired()) return;
            std::vector<Value> none;
            done(status::BadNotConnected, none);
        });
        return;
    }
    request(type, response, fill, std::move(done));
    armSilence();
}

void UaClient::request(const StructType& type, const StructType& response, const Fill& fill,
                       Done done) {
    const auto handle = nextHandle_++;
    const std::weak_ptr<bool> alive = alive_;
    pending_[handle] = Pending{&response, type.encodingId + ResponseOffset, std::move(done),
                               loop_.schedule(options_.callTimeout,
                                              [this, alive, handle] {
                                                  if (alive.expired()) return;
                                                  std::vector<Value> none;
                                                  respond(handle, status::BadTimeout, none);
                                              }),
                               false};
    send(type, fill, handle, static_cast<uint32_t>(options_.callTimeout.count()));
}

void UaClient::publishing(bool on) {
    publishing_ = on;
    if (on) topUpPublish();
}

void UaClient::topUpPublish() {
    if (!publishing_ || state_ != State::Active || !stream_) return;
    const std::weak_ptr<bool> alive = alive_;
    while (publishOut_ < options_.publishRequests) {
        const auto handle = nextHandle_++;
        // The server holds a publish request until it has something to say: the silence
        // watch, not this timer, notices a server that is gone.
        pending_[handle] =
            Pending{&msg::PublishResponse, msg::PublishRequest.encodingId + ResponseOffset, nullptr,
                    loop_.schedule(options_.silence * 4,
                                   [this, alive, handle] {
                                       if (alive.expired()) return;
                                       std::vector<Value> none;
                                       respond(handle, status::BadTimeout, none);
                                   }),
                    true};
        ++publishOut_;
        auto acks = std::move(acks_);
        acks_.clear();
        send(
            msg::PublishRequest,
            [&acks](std::vector<Value>& v) {
                AddLength(v, static_cast<uint32_t>(acks.size()));
                for (const auto& [sub, seq] : acks) {
                    AddNumber(v, sub);
                    AddNumber(v, seq);
                }
            },
            handle, static_cast<uint32_t>((options_.silence * 4).count()));
    }
    armSilence();
}

void UaClient::onPublish(uint32_t s, std::vector<Value>& v) {
    if (publishOut_ > 0) --publishOut_;
    const std::weak_ptr<bool> alive = alive_;
    if (IsBad(s)) {
        const uint32_t k = s & 0xFFFF0000u;
        if (k == status::BadNoSubscription) {
            publishing_ = false;
            if (handlers_.subscriptionLost) handlers_.subscriptionLost(0, s);
            return;
        }
        if (k == status::BadTooManyPublishRequests) {
            options_.publishRequests = std::max<uint32_t>(1, publishOut_);
            return;
        }
        if (k != status::BadTimeout) return;
        topUpPublish();
        return;
    }
    const size_t i = AfterHeader(v);
    if (v.size() < i + 2) return;
    const auto subscription = static_cast<uint32_t>(v[i].number);
    size_t at = i + 2 + v[i + 1].count;  // past availableSequenceNumbers
    ++at;                                // moreNotifications
    const auto sequence = static_cast<uint32_t>(v.at(at++).number);
    ++at;  // publishTime
    const uint32_t notifications = v.at(at++).count;
    if (notifications > 0) acks_.emplace_back(subscription, sequence);
    // The notifications are decoded into a vector of our own: the handlers may call the
    // client, which reuses notes_.
    std::vector<Value> items;
    for (uint32_t n = 0; n < notifications; ++n) {
        const Value& eo = v.at(at++);
        Reader body(eo.text);
        if (eo.node.numeric == id::DataChangeNotification) {
            Decode(body, msg::DataChangeNotification, items);
            const uint32_t count = items.empty() ? 0 : items[0].count;
            for (uint32_t k = 0; k < count; ++k) {
                const auto handle = static_cast<uint32_t>(items[1 + 2 * k].number);
                if (handlers_.dataChange)
                    handlers_.dataChange(subscription, handle, items[2 + 2 * k].data);
                if (alive.expired()) return;
            }
        } else if (eo.node.numeric == id::StatusChangeNotification) {
            Decode(body, msg::StatusChangeNotification, items);
            const auto st = static_cast<uint32_t>(items.at(0).number);
            if (IsBad(st) && handlers_.subscriptionLost)
                handlers_.subscriptionLost(subscription, st);
            if (alive.expired()) return;
        }
    }
    topUpPublish();
}

int64_t UaClient::ticksNow() const {
    const auto ms = std::chrono::duration_cast<std::chrono::milliseconds>(
        std::chrono::system_clock::now().time_since_epoch());
    return TicksFromUnixMs(ms.count());
}

}  // namespace maroset::platform::opcua
