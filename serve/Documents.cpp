#include "serve/Documents.h"

#include <cstdint>
#include <cstdio>
#include <utility>

#include "serve/Conditions.h"

namespace zmcserve {

Answer JsonAnswer(const zmcdescribe::Json& document) {
    Answer answer;
    answer.type = "application/json";
    answer.body = document.dump(-1, ' ', false, zmcdescribe::Json::error_handler_t::replace) + '\n';
    answer.compressible = true;
    return answer;
}

Answer WithTextTag(const Request& request, Answer document) {
    const Validators validators{'"' + VariantOf(document.Text()) + '"', std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    SetValidators(document, validators);
    return document;
}

std::string VariantOf(std::string_view text) {
    std::uint64_t hash = 0xCBF29CE484222325u;  // FNV-1a
    for (const char c : text) hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3u;
    char digits[20];
    static_cast<void>(
        std::snprintf(digits, sizeof digits, "%016llx", static_cast<unsigned long long>(hash)));
    return digits;
}

}  // namespace zmcserve
