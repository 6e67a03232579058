// Router: from a request to the handler that answers it, by the first segment of the path.
//
// Every service is a Route and is told at /api with its URLs. A handler is a plain function, which
// tests call without a socket; what it throws becomes an answer here. A new service is a source
// with a function that gives its Routes, named in AllRoutes.
#ifndef ZMC_SERVE_ROUTER_H
#define ZMC_SERVE_ROUTER_H

#include <optional>
#include <string>
#include <vector>

#include "serve/Answer.h"
#include "serve/Request.h"

namespace zmcserve {

struct Service;

inline constexpr const char* kMethods = "GET, HEAD, OPTIONS";
inline constexpr const char* kOtherMethods = "only GET, HEAD and OPTIONS are answered";

// GET and HEAD alone come here. May throw Refusal, zmchost::Error, zmcrender::StyleError and
// std::bad_alloc.
using Handler = Answer (*)(const Request& request, Service& service);
// The same where it takes no longer than a few calls of the system, or where the request may
// compute than about a millisecond; nothing where it would.
using QuickHandler = std::optional<Answer> (*)(const Request& request, Service& service);

// A URL as a template (RFC 6570) below the base: "/tiles/{name}/{z}/{x}/{y}.{format}".
struct Endpoint {
    std::string name;  // for programs: "tiles"
    std::string url;
    std::string description;
};

struct Route {
    std::string segment;  // the first of the path
    Handler handle = nullptr;
    QuickHandler quick = nullptr;     // null: there is none
    std::vector<Endpoint> endpoints;  // as /api tells them
};

class Router {
public:
    explicit Router(std::vector<Route> all) : routes(std::move(all)) {}

    const std::vector<Route>& Routes() const { return routes; }
    // The answer, whatever happens: failures are answers of one line. It has the headers that all
    // answers have.
    Answer Handle(const Request& request, Service& service) const;
    // The same at once, or nothing where it takes work. What is refused at once is an answer.
    std::optional<Answer> HandleQuickly(const Request& request, Service& service) const;

private:
    const Route* Find(const Request& request) const;

    std::vector<Route> routes;
};

// Those of all services, in the order in which /api tells them.
std::vector<Route> AllRoutes();

// The answer to what is being handled as an exception; to be called from a handler of one.
Answer AnswerOfException();

// An answer that no router has made, with the headers that all answers have.
Answer Finished(Answer answer);

}  // namespace zmcserve

#endif
