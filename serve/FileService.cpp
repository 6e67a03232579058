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

Answer FileAnswer(const Request& request, const ServedFilePtr& file) {
    const Validators validators{file->ETag(), file->Modified()};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const std::uint64_t size = file->Size();
    ByteRange range;
    const RangeKind kind = RangeOf(request, validators, size, range);
    if (kind == RangeKind::Unsatisfiable) return Unsatisfiable(size);
    Answer answer;
    answer.type = kType;
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

Answer HandleFile(const Request& request, Service& service) {
    return FileAnswer(request,
                      service.catalog.File(NameOfSegments(request, 1, request.segments.size())));
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
               "the file itself, with ranges: RFC 9110, one range in one request"}}}};
}

}  // namespace zmcserve
