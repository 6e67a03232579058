// The server itself: /api, /healthz and /metrics.
#include "describe/JsonNumbers.h"
#include "serve/Documents.h"
#include "serve/Service.h"
#include "serve/Services.h"
#include "serve/Version.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

Json FilesOf(const Request& request, const Catalog::Listing& listing) {
    Json files = Json::array();
    for (const std::string& name : listing.names) {
        const std::string encoded = PercentEncoded(name, true);
        files.push_back({{"name", name},
                         {"url", request.baseUrl + "/files/" + encoded},
                         {"preview", request.baseUrl + "/preview/" + encoded + ".webp?size=480"}});
    }
    return files;
}

Json ServicesOf(const Request& request, const Router& router) {
    Json services = Json::array();
    for (const Route& route : router.Routes())
        for (const Endpoint& endpoint : route.endpoints)
            services.push_back({{"name", endpoint.name},
                                {"url", request.baseUrl + endpoint.url},
                                {"description", endpoint.description}});
    return services;
}

Answer HandleApi(const Request& request, Service& service) {
    request.AllowKeys({});
    const Catalog::Listing listing = service.catalog.List();
    return JsonAnswer({{"name", "zmcraster"},
                       {"version", Version()},
                       {"files", FilesOf(request, listing)},
                       {"complete", listing.complete},
                       {"services", ServicesOf(request, service.router)}});
}

Answer HandleHealth(const Request&, Service&) {
    Answer answer = TextAnswer(200, "ok");
    answer.Set("Cache-Control", "no-store");
    return answer;
}

std::optional<Answer> QuickHealth(const Request& request, Service& service) {
    return HandleHealth(request, service);
}

Answer HandleMetrics(const Request&, Service& service) {
    Answer answer;
    answer.type = "text/plain; version=0.0.4; charset=utf-8";
    answer.body = service.metrics.Text();
    answer.Set("Cache-Control", "no-store");
    return answer;
}

std::optional<Answer> QuickMetrics(const Request& request, Service& service) {
    return HandleMetrics(request, service);
}

}  // namespace

std::vector<Route> ServerRoutes() {
    return {{"api", HandleApi, nullptr, {{"api", "/api", "this list"}}},
            {"healthz",
             HandleHealth,
             QuickHealth,
             {{"healthz", "/healthz", "answers 200, however much there is to do"}}},
            {"metrics",
             HandleMetrics,
             QuickMetrics,
             {{"metrics", "/metrics", "counters in the text format of Prometheus"}}}};
}

}  // namespace zmcserve
