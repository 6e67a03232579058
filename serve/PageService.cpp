// The viewer at /, or a plain list of the files where the program has none.
#include <algorithm>

#include "serve/Conditions.h"
#include "serve/Pages.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

// Nothing from elsewhere, and no script but the page's own files. Pictures may be made by scripts;
// data may come from other servers, whose rasters the viewer opens as well.
constexpr const char* kPolicy =
    "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self' data: blob:; "
    "connect-src *; worker-src 'self' blob:; manifest-src 'self'; base-uri 'none'; "
    "form-action 'none'; frame-ancestors 'self'";

void Guard(Answer& answer) {
    answer.Set("Content-Security-Policy", kPolicy);
    answer.Set("Referrer-Policy", "no-referrer");
}

Answer PageAnswer(const Request& request, const Page& page) {
    const Validators validators{'"' + std::string(page.version) + '"', std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    Answer answer;
    answer.type = page.type;
    answer.body = std::string(page.bytes);
    answer.compressible = true;
    SetValidators(answer, validators);
    Guard(answer);
    return answer;
}

// A name as the text of a page has it.
std::string RowOf(const std::string& name) {
    const std::string encoded = PercentEncoded(name, true);
    return "<tr><td>" + Escaped(name) + "</td><td><a href=\"/preview/" + encoded +
           ".png\">picture</a></td><td><a href=\"/info/" + encoded +
           "\">description</a></td><td><a href=\"/files/" + encoded + "\">file</a></td></tr>\n";
}

Answer ListPage(Service& service, const char* note) {
    const Catalog::Listing listing = service.catalog.List();
    std::string text =
        "<!doctype html>\n<html lang=\"en\">\n<meta charset=\"utf-8\">\n"
        "<title>zmcraster</title>\n<h1>Pyramids</h1>\n";
    text.append(note).append("<table>\n");
    for (const std::string& name : listing.names) text += RowOf(name);
    text += "</table>\n";
    if (!listing.complete) text += "<p>There are more than are listed here.</p>\n";
    text += "<p><a href=\"/api\">All services</a></p>\n</html>\n";
    Answer answer;
    answer.type = "text/html; charset=utf-8";
    answer.body = std::move(text);
    answer.compressible = true;
    Guard(answer);
    return answer;
}

const Page* FindPage(std::string_view path) {
    const auto pages = Pages();
    const auto at = std::find_if(pages.begin(), pages.end(),
                                 [&](const Page& page) { return page.path == path; });
    return at == pages.end() ? nullptr : &*at;
}

}  // namespace

Answer AnswerOfPage(const Request& request, Service& service) {
    std::string path;
    for (const std::string& segment : request.segments) path += (path.empty() ? "" : "/") + segment;
    if (const Page* const page = FindPage(path.empty() ? "index.html" : path))
        return PageAnswer(request, *page);
    if (path.empty())
        return ListPage(service, "<p>This program was built without the viewer.</p>\n");
    throw Refusal(404, "there is no such service; /api lists them");
}

std::vector<Route> PageRoutes() {
    return {{"", AnswerOfPage, nullptr, {{"viewer", "/", "a page that shows the rasters"}}},
            {"list",
             [](const Request&, Service& service) { return ListPage(service, ""); },
             nullptr,
             {{"list", "/list", "the rasters as a page without scripts"}}}};
}

}  // namespace zmcserve
