#include "serve/Metrics.h"

#include <algorithm>
#include <cstdio>

namespace zmcserve {
namespace {

void Tell(std::string& text, const char* name, const char* kind, const char* help) {
    text.append("# HELP ").append(name).append(" ").append(help).append("\n");
    text.append("# TYPE ").append(name).append(" ").append(kind).append("\n");
}

void Value(std::string& text, const std::string& name, std::uint64_t value) {
    text.append(name).append(" ").append(std::to_string(value)).append("\n");
}

void One(std::string& text, const char* name, const char* kind, const char* help,
         std::uint64_t value) {
    Tell(text, name, kind, help);
    Value(text, name, value);
}

std::string Seconds(std::uint64_t microseconds) {
    char text[32];
    static_cast<void>(
        std::snprintf(text, sizeof text, "%g", static_cast<double>(microseconds) / 1e6));
    return text;
}

}  // namespace

void Metrics::Answered(int status, std::uint64_t bytes, std::chrono::nanoseconds time) {
    const auto took = static_cast<std::uint64_t>(
        std::chrono::duration_cast<std::chrono::microseconds>(time).count());
    const std::size_t hundreds =
        status >= 100 && status < 600 ? static_cast<std::size_t>(status) / 100 : 0;
    const auto bound = std::lower_bound(kBounds.begin(), kBounds.end(), took);
    ++byStatus[hundreds];
    ++byTime[static_cast<std::size_t>(bound - kBounds.begin())];
    bytesSent += bytes;
    microseconds += took;
}

std::string Metrics::Text() const {
    std::string text;
    Tell(text, "zmcraster_requests_total", "counter", "Requests that were answered.");
    for (std::size_t i = 1; i < byStatus.size(); ++i)
        Value(text, "zmcraster_requests_total{status=\"" + std::to_string(i) + "xx\"}",
              byStatus[i]);
    const char* const times = "zmcraster_request_duration_seconds";
    Tell(text, times, "histogram", "Time from the head of a request to the end of its answer.");
    std::uint64_t sum = 0;
    for (std::size_t i = 0; i < byTime.size(); ++i) {
        const std::string bound = i < kBounds.size() ? Seconds(kBounds[i]) : "+Inf";
        sum += byTime[i];
        Value(text, std::string(times) + "_bucket{le=\"" + bound + "\"}", sum);
    }
    text.append(times).append("_sum ").append(Seconds(microseconds)).append("\n");
    Value(text, std::string(times) + "_count", sum);
    One(text, "zmcraster_body_bytes_total", "counter", "Bytes of the bodies of answers.",
        bytesSent);
    One(text, "zmcraster_refused_total", "counter", "Requests refused because too many waited.",
        refusedAsBusy);
    One(text, "zmcraster_connections", "gauge", "Connections that are open.", connections);
    One(text, "zmcraster_waiting", "gauge", "Requests that wait for a worker.", waiting);
    One(text, "zmcraster_working", "gauge", "Requests that workers are at.", working);
    One(text, "zmcraster_log_lines_lost_total", "counter",
        "Lines of the access log that nobody took in time.", lostLogLines);
    return text;
}

}  // namespace zmcserve
