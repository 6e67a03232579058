#include "serve/Router.h"

#include <new>

#include "host/base/Error.h"
#include "render/Style.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

// What scripts of pages from elsewhere may see, beside what every page may.
constexpr const char* kExposed =
    "Accept-Ranges, Content-Encoding, Content-Length, Content-Range, ETag, Link, Retry-After, "
    "X-Picture-Place, X-Raster-Bands, X-Raster-Height, X-Raster-Order, X-Raster-Type, "
    "X-Raster-Width";

void AddCommonHeaders(Answer& answer) {
    answer.Set("Access-Control-Allow-Origin", "*");
    answer.Set("Access-Control-Expose-Headers", kExposed);
    answer.Set("X-Content-Type-Options", "nosniff");
    if (answer.Header("Cache-Control").empty()) answer.Set("Cache-Control", "no-cache");
}

Answer OptionsAnswer() {
    Answer answer;
    answer.status = 204;
    answer.Set("Allow", kMethods);
    answer.Set("Access-Control-Allow-Methods", kMethods);
    answer.Set("Access-Control-Allow-Headers", "Range, If-Range, If-None-Match, If-Modified-Since");
    answer.Set("Access-Control-Max-Age", "86400");
    return answer;
}

// What needs no handler.
std::optional<Answer> AnswerOfMethod(const Request& request) {
    if (request.method == Method::Options) return OptionsAnswer();
    if (request.method != Method::Other) return std::nullopt;
    return ToAnswer(Refusal(405, kOtherMethods).With("Allow", kMethods));
}

}  // namespace

std::vector<Route> AllRoutes() {
    std::vector<Route> routes;
    for (std::vector<Route> (*service)() : kServices)
        for (Route& route : service()) routes.push_back(std::move(route));
    return routes;
}

const Route* Router::Find(const Request& request) const {
    for (const Route& route : routes)
        if (!request.segments.empty() && request.segments[0] == route.segment) return &route;
    return nullptr;
}

Answer Router::Handle(const Request& request, Service& service) const try {
    if (auto answer = AnswerOfMethod(request)) return Finished(std::move(*answer));
    const Route* const route = Find(request);
    return Finished(route ? route->handle(request, service) : AnswerOfPage(request, service));
} catch (...) {
    return Finished(AnswerOfException());
}

std::optional<Answer> Router::HandleQuickly(const Request& request, Service& service) const try {
    if (auto answer = AnswerOfMethod(request)) return Finished(std::move(*answer));
    const Route* const route = Find(request);
    if (!route || !route->quick) return std::nullopt;
    auto answer = route->quick(request, service);
    if (answer) AddCommonHeaders(*answer);
    return answer;
} catch (...) {
    return Finished(AnswerOfException());
}

Answer Finished(Answer answer) {
    AddCommonHeaders(answer);
    return answer;
}

Answer AnswerOfException() {
    try {
        throw;
    } catch (const Refusal& refusal) {
        return ToAnswer(refusal);
    } catch (const zmcrender::StyleError& error) {
        return ToAnswer(Refusal(400, error.what()));
    } catch (const std::bad_alloc&) {
        return ToAnswer(Refusal::Busy("there is not enough memory for it now", 10));
    } catch (const std::exception& error) {
        return ToAnswer(Refusal(500, error.what()));
    }
}

}  // namespace zmcserve
