#include "store/HttpClient.h"

#include <curl/curl.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <string_view>
#include <utility>

namespace zmcstore {
namespace {

constexpr std::size_t kMostAnswerBytes = std::size_t{1} << 20;
constexpr std::size_t kMostHeaderBytes = std::size_t{256} << 10;
constexpr std::size_t kMostHeaderValue = 512;
// A request that brings no bytes with it, from its beginning to its end.
constexpr long kWholeSeconds = 600;

struct FreeList {
    void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};
using List = std::unique_ptr<curl_slist, FreeList>;

void Append(List& list, const std::string& line) {
    curl_slist* const longer = curl_slist_append(list.get(), line.c_str());
    if (!longer) throw std::bad_alloc();
    static_cast<void>(list.release());
    list.reset(longer);
}

// The value of a header line of that name, in small letters; false for another one.
bool HasName(std::string_view line, std::string_view name, std::string& value) {
    if (line.size() <= name.size() || line[name.size()] != ':') return false;
    for (std::size_t i = 0; i < name.size(); ++i)
        if (std::tolower(static_cast<unsigned char>(line[i])) != name[i]) return false;
    line.remove_prefix(name.size() + 1);
    const std::size_t first = line.find_first_not_of(" \t");
    const std::size_t last = line.find_last_not_of(" \t\r\n");
    value = first == line.npos ? "" : std::string(line.substr(first, last - first + 1));
    if (value.size() > kMostHeaderValue) value.clear();
    return true;
}

bool IsPassing(CURLcode code) {
    switch (code) {
        case CURLE_COULDNT_RESOLVE_HOST:
        case CURLE_COULDNT_RESOLVE_PROXY:
        case CURLE_COULDNT_CONNECT:
        case CURLE_PARTIAL_FILE:
        case CURLE_OPERATION_TIMEDOUT:
        case CURLE_GOT_NOTHING:
        case CURLE_SEND_ERROR:
        case CURLE_RECV_ERROR:
        case CURLE_SSL_CONNECT_ERROR:
        case CURLE_SEND_FAIL_REWIND:
            return true;
        default:
            return false;
    }
}

}  // namespace

struct HttpClient::Handle {
    CURL* curl = curl_easy_init();
    ~Handle() { curl_easy_cleanup(curl); }
};

// One request under way, with what the library calls back.
struct HttpClient::Exchange {
    const HttpRequest& request;
    const HttpSettings& settings;
    CURL* curl;
    HttpAnswer answer;
    List headers;
    std::size_t headerBytes = 0;
    std::uint64_t sent = 0;  // of the body
    std::string refusal;     // why a callback ended the exchange
    bool cancelled = false;

    static std::size_t TakeText(char* bytes, std::size_t, std::size_t size, void* self) {
        auto& exchange = *static_cast<Exchange*>(self);
        if (exchange.answer.text.size() + size > kMostAnswerBytes) {
            exchange.refusal = "its answer is longer than an answer of a store";
            return 0;
        }
        exchange.answer.text.append(bytes, size);
        return size;
    }
    static std::size_t TakeHeader(char* bytes, std::size_t, std::size_t size, void* self) {
        auto& exchange = *static_cast<Exchange*>(self);
        exchange.headerBytes += size;
        if (exchange.headerBytes > kMostHeaderBytes) {
            exchange.refusal = "its answer has more headers than an answer of a store";
            return 0;
        }
        const std::string_view line(bytes, size);
        // Those of an answer that comes before the answer are not its own.
        if (line.starts_with("HTTP/")) exchange.answer = {};
        if (!HasName(line, "etag", exchange.answer.tag))
            HasName(line, "x-amz-meta-zmcraster", exchange.answer.mark);
        return size;
    }
    static std::size_t GiveBody(char* bytes, std::size_t unit, std::size_t count, void* self) {
        auto& exchange = *static_cast<Exchange*>(self);
        const Body& body = *exchange.request.body;
        const auto size = static_cast<std::size_t>(
            std::min<std::uint64_t>(unit * count, body.size - exchange.sent));
        if (body.source->ReadAt(body.offset + exchange.sent, bytes, size) != size) {
            exchange.refusal = "what is to be sent cannot be read";
            return CURL_READFUNC_ABORT;
        }
        exchange.sent += size;
        return size;
    }
    static int Rewind(void* self, curl_off_t offset, int origin) {
        if (origin != SEEK_SET || offset < 0) return CURL_SEEKFUNC_FAIL;
        static_cast<Exchange*>(self)->sent = static_cast<std::uint64_t>(offset);
        return CURL_SEEKFUNC_OK;
    }
    static int Look(void* self, curl_off_t, curl_off_t, curl_off_t, curl_off_t) {
        auto& exchange = *static_cast<Exchange*>(self);
        exchange.cancelled = exchange.settings.cancelled && exchange.settings.cancelled();
        return exchange.cancelled ? 1 : 0;
    }

    template <class Value>
    void Set(CURLoption option, Value value) {
        if (const CURLcode code = curl_easy_setopt(curl, option, value); code != CURLE_OK)
            throw NoAnswer(NoAnswer::Cause::Lasting, curl_easy_strerror(code));
    }

    void SetCallbacks() {
        Set(CURLOPT_WRITEFUNCTION, &TakeText);
        Set(CURLOPT_WRITEDATA, this);
        Set(CURLOPT_HEADERFUNCTION, &TakeHeader);
        Set(CURLOPT_HEADERDATA, this);
        Set(CURLOPT_XFERINFOFUNCTION, &Look);
        Set(CURLOPT_XFERINFODATA, this);
        Set(CURLOPT_NOPROGRESS, 0L);
    }
    void SetMethod() {
        if (request.body) {
            Set(CURLOPT_UPLOAD, 1L);
            Set(CURLOPT_INFILESIZE_LARGE, static_cast<curl_off_t>(request.body->size));
            Set(CURLOPT_READFUNCTION, &GiveBody);
            Set(CURLOPT_READDATA, this);
            Set(CURLOPT_SEEKFUNCTION, &Rewind);
            Set(CURLOPT_SEEKDATA, this);
            return;
        }
        Set(CURLOPT_TIMEOUT, kWholeSeconds);
        if (request.method == "HEAD") Set(CURLOPT_NOBODY, 1L);
        if (request.method == "POST") {
            Set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request.text.size()));
            Set(CURLOPT_POSTFIELDS, request.text.c_str());
        }
        if (request.method == "DELETE") Set(CURLOPT_CUSTOMREQUEST, "DELETE");
    }
    void SetConnection() {
        Set(CURLOPT_NOSIGNAL, 1L);
        Set(CURLOPT_PROTOCOLS_STR, "http,https");
        Set(CURLOPT_CONNECTTIMEOUT, settings.connectSeconds);
        Set(CURLOPT_LOW_SPEED_LIMIT, 1L);
        Set(CURLOPT_LOW_SPEED_TIME, settings.silentSeconds);
        if (!settings.authorities.empty()) Set(CURLOPT_CAINFO, settings.authorities.c_str());
        if (settings.anyAuthority) {
            Set(CURLOPT_SSL_VERIFYPEER, 0L);
            Set(CURLOPT_SSL_VERIFYHOST, 0L);
        }
    }
    void SetSignature() {
        if (settings.keyId.empty()) return;
        Set(CURLOPT_AWS_SIGV4, ("aws:amz:" + settings.region + ":s3").c_str());
        Set(CURLOPT_USERNAME, settings.keyId.c_str());
        Set(CURLOPT_PASSWORD, settings.secret.c_str());
    }
};

HttpClient::HttpClient(HttpSettings clientSettings)
    : settings(std::move(clientSettings)), handle(std::make_unique<Handle>()) {
    if (!handle->curl) throw std::bad_alloc();
}

HttpClient::~HttpClient() = default;

void HttpClient::Prepare(Exchange& exchange) {
    curl_easy_reset(handle->curl);
    for (const std::string& line : exchange.request.headers) Append(exchange.headers, line);
    exchange.Set(CURLOPT_URL, exchange.request.url.c_str());
    exchange.Set(CURLOPT_HTTPHEADER, exchange.headers.get());
    exchange.SetCallbacks();
    exchange.SetMethod();
    exchange.SetConnection();
    exchange.SetSignature();
}

HttpAnswer HttpClient::Ask(const HttpRequest& request) {
    Exchange exchange{request, settings, handle->curl, {}, {}, 0, 0, {}, false};
    Prepare(exchange);
    const CURLcode code = curl_easy_perform(handle->curl);
    if (exchange.cancelled) throw NoAnswer(NoAnswer::Cause::Cancelled, "cancelled");
    if (!exchange.refusal.empty()) throw NoAnswer(NoAnswer::Cause::Lasting, exchange.refusal);
    if (code == CURLE_OUT_OF_MEMORY) throw std::bad_alloc();
    if (code != CURLE_OK)
        throw NoAnswer(IsPassing(code) ? NoAnswer::Cause::Passing : NoAnswer::Cause::Lasting,
                       curl_easy_strerror(code));
    curl_easy_getinfo(handle->curl, CURLINFO_RESPONSE_CODE, &exchange.answer.status);
    return std::move(exchange.answer);
}

std::string HttpClient::Escaped(const std::string& text, bool keepSlashes) {
    constexpr const char* kDigits = "0123456789ABCDEF";
    std::string escaped;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        const bool plain = byte < 0x80 && (std::isalnum(byte) || std::strchr("-._~", c));
        if ((plain && c != '\0') || (keepSlashes && c == '/')) {
            escaped += c;
        } else {
            escaped += '%';
            escaped += kDigits[byte >> 4];
            escaped += kDigits[byte & 15];
        }
    }
    return escaped;
}

}  // namespace zmcstore
