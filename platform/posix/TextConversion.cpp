#include "platform/TextConversion.h"

#include <langinfo.h>
#include <unicode/uchar.h>
#include <unicode/ucnv.h>
#include <unicode/ucnv_cb.h>
#include <unicode/ustring.h>

#include <limits>
#include <memory>

namespace platform {
namespace {

constexpr UChar kReplacement = 0xFFFD;

// ICU counts in 32-bit signed numbers; longer text is refused rather than cut.
bool FitsIcu(std::size_t n) { return n <= std::size_t{std::numeric_limits<int32_t>::max()}; }

// A preflight and a full buffer are no failures: the size needed is the answer.
std::size_t Answer(UErrorCode status, int32_t needed) {
    if (U_FAILURE(status) && status != U_BUFFER_OVERFLOW_ERROR) return kConversionFailed;
    return static_cast<std::size_t>(needed);
}

// What a charset cannot hold becomes '?', characters that show nothing included, which ICU's own
// callback drops. A surrogate without its partner becomes U+FFFD first, and '?' only where that has
// no place either.
void Substitute(const void*, UConverterFromUnicodeArgs* arguments, const UChar*, int32_t, UChar32,
                UConverterCallbackReason reason, UErrorCode* status) {
    if (reason > UCNV_IRREGULAR) return;  // no character: the converter is reset, cloned or closed
    *status = U_ZERO_ERROR;
    if (reason == UCNV_UNASSIGNED) return ucnv_cbFromUWriteBytes(arguments, "?", 1, 0, status);
    const UChar replacement = kReplacement;
    const UChar* next = &replacement;
    ucnv_cbFromUWriteUChars(arguments, &next, &replacement + 1, 0, status);
}

struct ConverterCloser {
    void operator()(UConverter* converter) const { ucnv_close(converter); }
};

}  // namespace

std::size_t Utf8ToUtf16(const char* text, std::size_t length, char16_t* out, std::size_t capacity) {
    if (!FitsIcu(length) || !FitsIcu(capacity)) return kConversionFailed;
    UErrorCode status = U_ZERO_ERROR;
    int32_t needed = 0;
    u_strFromUTF8WithSub(out, static_cast<int32_t>(capacity), &needed, text,
                         static_cast<int32_t>(length), kReplacement, nullptr, &status);
    return Answer(status, needed);
}

std::size_t Utf16ToUtf8(const char16_t* text, std::size_t length, char* out, std::size_t capacity) {
    if (!FitsIcu(length) || !FitsIcu(capacity)) return kConversionFailed;
    UErrorCode status = U_ZERO_ERROR;
    int32_t needed = 0;
    u_strToUTF8WithSub(out, static_cast<int32_t>(capacity), &needed, text,
                       static_cast<int32_t>(length), kReplacement, nullptr, &status);
    return Answer(status, needed);
}

std::size_t Utf16ToLocale(const char16_t* text, std::size_t length, char* out,
                          std::size_t capacity) {
    if (!FitsIcu(length) || !FitsIcu(capacity)) return kConversionFailed;
    UErrorCode status = U_ZERO_ERROR;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): it minds setlocale alone, which is the host's to call.
    const char* const charset = nl_langinfo(CODESET);
    std::unique_ptr<UConverter, ConverterCloser> converter(ucnv_open(charset, &status));
    if (!converter) return kConversionFailed;
    ucnv_setFromUCallBack(converter.get(), Substitute, nullptr, nullptr, nullptr, &status);
    const int32_t needed = ucnv_fromUChars(converter.get(), out, static_cast<int32_t>(capacity),
                                           text, static_cast<int32_t>(length), &status);
    return Answer(status, needed);
}

char16_t ToLowerUnit(char16_t unit) {
    const UChar32 lower = u_tolower(unit);
    // unreachable: no letter's lower case needs two units where the letter itself does not
    return lower <= 0xFFFF ? static_cast<char16_t>(lower) : unit;
}

}  // namespace platform
