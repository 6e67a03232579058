#include "python/PythonSource.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

#include "gdal/SourceNumber.h"

namespace zmcpython {

namespace py = pybind11;
using zelm::files::Identity;
using zelm::files::Transfer;

class PythonSource::Turn {
public:
    explicit Turn(const PythonSource& owner) : source(owner) {
        if (source.holder == std::this_thread::get_id()) return;
        lock = std::unique_lock(source.mutex);
        source.holder = std::this_thread::get_id();
    }
    ~Turn() {
        if (lock) source.holder = std::thread::id();
    }
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;
    explicit operator bool() const { return lock.owns_lock(); }

private:
    const PythonSource& source;
    std::unique_lock<std::mutex> lock;
};

PythonSource::PythonSource(py::object fileObject)
    : number(zmcgdal::NextSourceNumber()), file(std::move(fileObject)) {}

// NOLINTNEXTLINE(bugprone-exception-escape): not while there is a Python.
PythonSource::~PythonSource() {
    const py::gil_scoped_acquire python;
    file = py::object();
    failure = PythonFailure();
}

// 0, or the number of the error that stands for what was raised.
template <class Work>
int PythonSource::Ask(Work&& work) const {
    const Turn turn(*this);
    if (!turn) return EDEADLK;
    const py::gil_scoped_acquire python;
    try {
        return std::forward<Work>(work)();
    } catch (const py::error_already_set& raised) {
        failure.Keep(raised);
        return EIO;
    }
}

// Some objects answer nothing to a seek, and tell the place when they are asked.
std::uint64_t PythonSource::Seek(std::uint64_t offset, int from) const {
    py::object place = file.attr("seek")(offset, from);
    if (place.is_none()) place = file.attr("tell")();
    const unsigned long long told = PyLong_AsUnsignedLongLong(place.ptr());
    if (PyErr_Occurred()) throw py::error_already_set();
    return told;
}

Transfer PythonSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    Transfer done;
    done.error = Ask([&] {
        if (Seek(offset, SEEK_SET) != offset) return EIO;
        // No view of the buffer is given away: whoever kept it could write there for ever.
        const py::object answer = file.attr("read")(size);
        char* bytes = nullptr;
        Py_ssize_t length = 0;
        if (PyBytes_AsStringAndSize(answer.ptr(), &bytes, &length) != 0)
            throw py::error_already_set();
        if (static_cast<std::size_t>(length) > size) return EIO;
        std::memcpy(buffer, bytes, static_cast<std::size_t>(length));
        done.bytes = static_cast<std::size_t>(length);
        done.end = length == 0;
        return 0;
    });
    return done;
}

int PythonSource::DoTellSize(std::uint64_t& size) const {
    return Ask([&] {
        size = Seek(0, SEEK_END);
        return 0;
    });
}

Identity PythonSource::DoIdentify() const {
    std::uint64_t size = 0;
    if (DoTellSize(size) != 0) return {};
    return {true, zmcgdal::kNoVolume, number, size, 0, 0};
}

}  // namespace zmcpython
