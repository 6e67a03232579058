// ErrorCatcher: what GDAL reports on this thread, for as long as the object lives.
//
// Some of GDAL's failures are told by nothing else, and on a builder's thread they would reach
// nobody. Catchers are ended in the opposite order of their beginning.
#ifndef ZMC_GDAL_ERRORCATCHER_H
#define ZMC_GDAL_ERRORCATCHER_H

#include <cpl_error.h>

#include <new>
#include <string>
#include <vector>

namespace zmcgdal {

struct CaughtWarning {
    CPLErrorNum number = CPLE_None;
    std::string text;
};

class ErrorCatcher {
public:
    // Reports below `leastKind` are passed over; what is a warning of them goes to the end of the
    // list, which lives longer, if there is one.
    explicit ErrorCatcher(CPLErr leastKind, std::vector<CaughtWarning>* passedOver = nullptr)
        : least(leastKind), warnings(passedOver) {
        CPLPushErrorHandlerEx(&ErrorCatcher::Take, this);
    }
    ~ErrorCatcher() { CPLPopErrorHandler(); }
    ErrorCatcher(const ErrorCatcher&) = delete;
    ErrorCatcher& operator=(const ErrorCatcher&) = delete;

    // The first one that was caught; empty if there was none.
    const std::string& Text() const { return text; }
    // Its number; CPLE_None if there was none.
    CPLErrorNum Number() const { return number; }

private:
    const CPLErr least;
    std::vector<CaughtWarning>* const warnings;
    std::string text;
    CPLErrorNum number = CPLE_None;

    static void CPL_STDCALL Take(CPLErr kind, CPLErrorNum what, const char* message) {
        auto* const self = static_cast<ErrorCatcher*>(CPLGetErrorHandlerUserData());
        if (kind < self->least) return self->PassOver(kind, what, message);
        if (!self->text.empty()) return;
        self->number = what;
        try {
            self->text = message;
        } catch (const std::bad_alloc&) {
            self->text = "out of memory";  // without any: so short a text lies in the string itself
        }
    }
    void PassOver(CPLErr kind, CPLErrorNum what, const char* message) noexcept {
        if (kind != CE_Warning || !warnings) return;
        try {
            warnings->push_back({what, message});
        } catch (const std::bad_alloc&) {
            return;  // work goes on without it
        }
    }
};

}  // namespace zmcgdal

#endif
