// The files themselves, at /files/NAME.
#include "serve/Conditions.h"
#include "serve/Names.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

constexpr const char* kType = "application/octet-stream";

Answer Unsatisfiable(std::uint64_t size) {
    return ToAnswer(Refusal(416, "none of the bytes that are asked for are there")
                        .With("Content-Range", "bytes */" + std::to_string(size)));
}

Answer FileAnswer(const Request& request, const ServedFilePtr& file, const char* type = kType) {
    const Validators validators{file->ETag(), file->Modified()};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const std::uint64_t size = file->Size();
    ByteRange range;
    const RangeKind kind = RangeOf(request, validators, size, range);
    if (kind == RangeKind::Unsatisfiable) return Unsatisfiable(size);
    Answer answer;
    answer.type = type;
    SetValidators(answer, validators);
    answer.Set("Accept-Ranges", "bytes");
    answer.body = FileRange{file, 0, size};
    if (kind == RangeKind::Whole) return answer;
    answer.status = 206;
    answer.Set("Content-Range", "bytes " + std::to_string(range.offset) + "-" +
                                    std::to_string(range.offset + range.size - 1) + "/" +
                                    std::to_string(size));
    answer.body = FileRange{file, range.offset, range.size};
    return answer;
}

// The sidecar of a raster. Readers ask for it each time, and that there is none is no fault.
std::optional<Answer> SidecarAnswer(const Request& request, Service& service,
                                    std::string_view name) {
    if (!name.ends_with(kSidecar)) return std::nullopt;
    const auto sidecar =
        service.catalog.Sidecar(name.substr(0, name.size() - std::string_view(kSidecar).size()));
    if (!sidecar) return std::nullopt;
    if (*sidecar) return FileAnswer(request, *sidecar, "application/xml");
    Answer none;
    none.status = 204;
    return none;
}

Answer HandleFile(const Request& request, Service& service) {
    const std::string name = NameOfRest(request);
    if (auto answer = SidecarAnswer(request, service, name)) return std::move(*answer);
    return FileAnswer(request, service.catalog.File(name));
}

std::optional<Answer> HandleFileQuickly(const Request& request, Service& service) {
    return HandleFile(request, service);
}

}  // namespace

std::vector<Route> FileRoutes() {
    return {{"files",
             HandleFile,
             HandleFileQuickly,
             {{"files", "/files/{+name}",
               "the file itself, with ranges: RFC 9110, one range in one request; at NAME.aux.xml "
               "its sidecar, or 204"}}}};
}

}  // namespace zmcserve
