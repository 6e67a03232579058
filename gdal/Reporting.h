// Reporting: where what our code throws becomes an error of GDAL's.
//
// GDAL calls from C, and its other drivers throw nothing: an exception that passed through it would
// end the process, or leave its locks and references behind. So every function that GDAL calls does
// its work in here. Any thread.
#ifndef ZMC_GDAL_REPORTING_H
#define ZMC_GDAL_REPORTING_H

#include <cpl_error.h>

#include <exception>
#include <new>
#include <type_traits>
#include <utility>

#include "host/base/Error.h"

namespace zmcgdal {

// Tells a caller who asked for it whether a value is known.
inline void ReportSuccess(int* success, bool value) {
    if (success) *success = value ? TRUE : FALSE;
}

// Tells GDAL of the exception in hand.
inline void ReportCaught(CPLErrorNum kind) noexcept {
    try {
        throw;
    } catch (const zmchost::Cancelled& error) {
        CPLError(CE_Failure, CPLE_UserInterrupt, "%s", error.what());
    } catch (const std::bad_alloc&) {
        CPLError(CE_Failure, CPLE_OutOfMemory, "out of memory");
    } catch (const std::exception& error) {
        CPLError(CE_Failure, kind, "%s", error.what());
    } catch (...) {
        CPLError(CE_Failure, kind, "it failed, and does not say why");
    }
}

// The result of `work`, or `failure` for what it throws.
template <class Result, class Work>
Result Reporting(Result failure, Work&& work, CPLErrorNum kind = CPLE_AppDefined) noexcept {
    try {
        return std::forward<Work>(work)();
    } catch (...) {
        ReportCaught(kind);
    }
    return failure;
}

// The same for work without a result, and false where it has thrown.
template <class Work>
bool Reported(Work&& work, CPLErrorNum kind = CPLE_AppDefined) noexcept {
    return Reporting(
        false,
        [&] {
            std::forward<Work>(work)();
            return true;
        },
        kind);
}

}  // namespace zmcgdal

#endif
