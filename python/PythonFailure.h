// PythonFailure: what Python code raised on a thread of ours, until it can be raised where Python
// called.
//
// All of it is used with Python's lock held.
#ifndef ZMC_PYTHON_PYTHONFAILURE_H
#define ZMC_PYTHON_PYTHONFAILURE_H

#include <pybind11/pybind11.h>

#include <memory>

namespace zmcpython {

class PythonFailure {
public:
    // The first one counts, until it is taken.
    void Keep(const pybind11::error_already_set& raised) {
        if (!kept) kept = std::make_unique<pybind11::error_already_set>(raised);
    }
    explicit operator bool() const { return kept != nullptr; }

    // Raises what was kept, if there is something.
    void Raise() {
        if (const auto raised = std::move(kept)) throw pybind11::error_already_set(*raised);
    }
    // The same as the cause of an exception of that type; as it is where it is none that programs
    // are expected to catch, such as an interruption by the keyboard.
    void RaiseAsCauseOf(pybind11::handle type, const char* text) {
        const auto raised = std::move(kept);
        if (!raised) return;
        const bool isUsual = raised->matches(PyExc_Exception);
        raised->restore();
        if (isUsual) pybind11::raise_from(type.ptr(), text);
        throw pybind11::error_already_set();
    }

private:
    std::unique_ptr<pybind11::error_already_set> kept;
};

}  // namespace zmcpython

#endif
