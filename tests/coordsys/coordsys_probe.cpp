// A process of its own for what happens once in a process: the settings of the projection log, the
// loading of the engine, the first release. Reports go to the standard error stream. The word
// "utf8" in front of a command sets such a locale before.
//
//   coordsys_probe log DIR COUNT LEVEL LENGTH  logs COUNT messages of LENGTH units x
//   coordsys_probe log DIR COUNT LEVEL LENGTH UNIT  the same, of units of that number
//   coordsys_probe threads DIR COUNT           two threads with COUNT messages each
//   coordsys_probe factory BIN PE GDAL         makes the factory; "-" leaves a setting out
//   coordsys_probe twice BIN PE                loads the entry points twice
//   coordsys_probe chain BIN PE CODE HANDLES   makes an object and destroys that many handles on it
//   coordsys_probe first BIN PE                releases an object before anybody loaded the engine
//   coordsys_probe unload BIN PE               deletes the factory with the library loaded
//   coordsys_probe second BIN PE               another loader of the engine comes and goes
//   coordsys_probe retry BIN PE                asks for a factory twice, the second time without
//   BIN
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "coordsys/CoordSys.h"
#include "coordsys/CoordSysFactory.h"
#include "coordsys/CoordSysLog.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

using namespace zelm;

namespace {

// Called where no other thread logs.
void ReportLog() ZMC_NO_LOCK_NEEDED {
    const CoordSysLog* const log = gpCoordSysLogInstance;
    if (!log) {
        std::fprintf(stderr, "no log\n");
        return;
    }
    std::fprintf(stderr, "mask=%u debugger=%d file=%d open=%d current=%d sequence=%u\n",
                 log->levelMask, log->toDebugger, log->toFile, log->stream ? 1 : 0,
                 log->currentFile, log->sequence);
}

void ReportEngine() {
    const CoordSysFactory* const factory = gpCoordSysFactoryInstance;
    std::fprintf(stderr, "factory=%d module=%d pointers=%d%d%d%d mutex=%d log=%d\n",
                 factory ? 1 : 0, factory && factory->funcPtrs.module ? 1 : 0,
                 fp_Esri_Pe_Initialize ? 1 : 0, fp_Esri_Pe_CreateFromString ? 1 : 0,
                 fp_Esri_Pe_CreateFromCode ? 1 : 0, fp_Esri_Pe_Release ? 1 : 0,
                 gpCoordSysMutex ? 1 : 0, gpCoordSysLogInstance ? 1 : 0);
}

void Set(const String& key, const std::string& value) {
    if (value != "-") Environment().GetSetting(key) = value.c_str();
}

void SetDirectories(const std::string& bin, const std::string& pe, const std::string& gdal) {
    Set(EnvironmentKeys::kBinDirectory, bin);
    Set(EnvironmentKeys::kPeDirectory, pe);
    Set(EnvironmentKeys::kGdalDirectory, gdal);
}

void DropLog() {
    delete gpCoordSysLogInstance;
    gpCoordSysLogInstance = nullptr;
}

void LogMany(std::uint32_t level, int count, const std::u16string& text) {
    for (int i = 0; i < count; ++i) CoordSysLog::LogMessage(level, u"%s", text.c_str());
}

void Log(const std::vector<std::string>& words) {
    CoordSysLog* const made = CoordSysLog::CreateInstance(words.at(1).c_str());
    if (made != gpCoordSysLogInstance) std::fprintf(stderr, "another log\n");
    ReportLog();
    const auto unit = static_cast<char16_t>(words.size() > 5 ? std::stoi(words[5]) : 'x');
    LogMany(static_cast<std::uint32_t>(std::stoul(words.at(3))), std::stoi(words.at(2)),
            std::u16string(std::stoul(words.at(4)), unit));
    ReportLog();
    DropLog();
}

void LogInThreads(const std::vector<std::string>& words) {
    CoordSysLog::CreateInstance(words.at(1).c_str());
    const int count = std::stoi(words.at(2));
    std::thread other([&] { LogMany(1, count, std::u16string(200, u'a')); });
    LogMany(1, count, std::u16string(300, u'b'));
    other.join();
    ReportLog();
    DropLog();
}

void LoadTwice(const std::vector<std::string>& words) {
    CoordSysLog::CreateInstance(words.at(2).c_str());
    {
        CoordSysFuncPtrs pointers;
        const int first = pointers.LoadFuncPtrs(words.at(1).c_str());
        // A second fetch would put the entry point back.
        fp_Esri_Pe_CreateFromCode = nullptr;
        const int second = pointers.LoadFuncPtrs(words.at(1).c_str());
        std::fprintf(stderr, "first=%d second=%d fetched=%d\n", first, second,
                     fp_Esri_Pe_CreateFromCode ? 1 : 0);
    }
    DropLog();
}

void Chain(const std::vector<std::string>& words) {
    SetDirectories(words.at(1), words.at(2), "-");
    CoordSysFactory::GetInstance();
    CoordSysImpl* const impl = fp_Esri_Pe_CreateFromCode(std::stoi(words.at(3)));
    for (int left = std::stoi(words.at(4)); left != 0; --left) {
        std::fprintf(stderr, "handle\n");
        CoordSys handle;
        handle.impl = impl;
    }
}

// An object of nobody's, so that nobody has loaded the engine when it goes.
class LonelyCoordSys final : public CoordSysImpl {
public:
    std::int32_t ReleaseReference() override { return 0; }
    std::int32_t AddReference() override { return 2; }  // nobody may delete it
    void GetName(String&) const override {}
    void GetDatumName(String&) const override {}
    void GetUnitName(String&) const override {}
    double GetUnitFactor() const override { return 1; }
    std::uint32_t GetUnitKind() const override { return 0; }
    std::int32_t GetUnitCode() const override { return 0; }
    Kind GetKind() const override { return Kind::Other; }
    void GetWkt2(String&) const override {}
    std::size_t Transform(const CoordSysImpl&, std::size_t, double*, double*,
                          double*) const override {
        return 0;
    }
};

void FirstRelease(const std::vector<std::string>& words) {
    SetDirectories(words.at(1), words.at(2), "-");
    ReportEngine();
    LonelyCoordSys lonely;
    {
        CoordSys handle;
        handle.impl = &lonely;
    }
    ReportEngine();
}

void ReleaseOneObject() {
    std::fprintf(stderr, "handle\n");
    CoordSys handle;
    handle.impl = fp_Esri_Pe_CreateFromCode(1);
}

void SecondLoader(const std::vector<std::string>& words) {
    SetDirectories(words.at(1), words.at(2), "-");
    CoordSysFactory::GetInstance();
    {
        CoordSysFuncPtrs second;
        second.LoadFuncPtrs(words.at(1).c_str());
    }
    ReportEngine();
    ReleaseOneObject();
}

void Retry(const std::vector<std::string>& words) {
    SetDirectories(words.at(1), words.at(2), "-");
    CoordSysFactory::GetInstance();
    ReportEngine();
    SetDirectories("/nowhere", words.at(2), "-");
    CoordSysFactory::GetInstance();
    ReportEngine();
}

int Run(const std::vector<std::string>& words) {
    const std::string& command = words.at(0);
    if (command == "log") {
        Log(words);
    } else if (command == "threads") {
        LogInThreads(words);
    } else if (command == "factory") {
        SetDirectories(words.at(1), words.at(2), words.at(3));
        CoordSysFactory::GetInstance();
        ReportEngine();
        if (gpCoordSysFactoryInstance)
            std::fprintf(stderr, "init=%d\n", gpCoordSysFactoryInstance->Init());
    } else if (command == "twice") {
        LoadTwice(words);
    } else if (command == "chain") {
        Chain(words);
        ReportEngine();
    } else if (command == "first") {
        FirstRelease(words);
    } else if (command == "unload") {
        SetDirectories(words.at(1), words.at(2), "-");
        delete CoordSysFactory::GetInstance();
        gpCoordSysFactoryInstance = nullptr;
        ReportEngine();
    } else if (command == "second") {
        SecondLoader(words);
    } else if (command == "retry") {
        Retry(words);
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<std::string> words(argv + 1, argv + argc);
    if (words.at(0) == "utf8") {
        std::setlocale(LC_ALL, "C.UTF-8");
        words.erase(words.begin());
    }
    return Run(words);
}
