// HttpClient: requests to one server, one after the other over a connection that stays, and answers
// that are kept no longer than an answer of a store can be.
//
// An exchange that comes to no answer is thrown as NoAnswer; what the answer says is the caller's
// affair. Redirections are not followed: a signature holds for one place. One thread at a time.
#ifndef ZMC_STORE_HTTPCLIENT_H
#define ZMC_STORE_HTTPCLIENT_H

#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "store/ObjectStore.h"

namespace zmcstore {

struct HttpSettings {
    std::string keyId;  // empty: requests are not signed
    std::string secret;
    std::string region;
    std::string authorities;    // file of certificates to believe; empty: the system's
    bool anyAuthority = false;  // of the server's certificate
    long connectSeconds = 30;
    long silentSeconds = 120;  // without a byte in either direction
    std::function<bool()> cancelled;
};

struct HttpRequest {
    std::string method;
    std::string url;
    std::vector<std::string> headers;  // "name: value"
    std::string text;                  // of a POST
    const Body* body = nullptr;        // of a PUT
};

struct HttpAnswer {
    long status = 0;
    std::string tag;   // header ETag
    std::string mark;  // header x-amz-meta-zmcraster
    std::string text;
};

class NoAnswer : public std::runtime_error {
public:
    enum class Cause {
        Passing,    // may be otherwise the next time
        Lasting,    // will not
        Cancelled,  // settings.cancelled said so
    };
    NoAnswer(Cause why, const std::string& reason) : std::runtime_error(reason), cause(why) {}
    const Cause cause;
};

class HttpClient {
public:
    explicit HttpClient(HttpSettings clientSettings);
    ~HttpClient();

    HttpAnswer Ask(const HttpRequest& request);

    // "%2F" for whatever is no letter, digit, '-', '.', '_' or '~'; '/' stays if it is to be kept.
    static std::string Escaped(const std::string& text, bool keepSlashes);

private:
    struct Exchange;
    struct Handle;
    void Prepare(Exchange& exchange);

    HttpSettings settings;
    std::unique_ptr<Handle> handle;
};

}  // namespace zmcstore

#endif
