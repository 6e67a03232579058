#include <chrono>
#include <cstdio>
#include <thread>

#include "gdal/LazyRaster.h"
#include "platform/FileSystem.h"
#include "platform/Interrupts.h"
#include "platform/Network.h"
#include "serve/HttpServer.h"
#include "tools/Arguments.h"
#include "tools/Command.h"

namespace zmctools {
namespace {

constexpr std::uint16_t kUsualPort = 8080;
constexpr std::uint64_t kMostSeconds = 86400;

class ServeCommand final : public Command {
public:
    const char* Name() const override { return "serve"; }
    const char* Summary() const override {
        return "Show pyramids in a browser, and serve their tiles";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::vector<std::string> named;
    std::string port, host = "127.0.0.1", baseUrl, accessLog;
    std::string threads, waiting, connections, idle, time, pixels, side, window;
    bool open = false;
    bool followLinks = false;

    zmcserve::ServiceLimits Limits() const;
    zmcserve::ServerOptions Options() const;
    void Tell(const zmcserve::HttpServer& server) const;
    std::string PageToOpen(const std::string& url, zmcserve::Service& service) const;
};

void ServeCommand::Describe(OptionTable& table) {
    table
        .Names("PATH", named,
               "Pyramid files, and folders whose pyramids are served, with those in "
               "folders below")
        .Required();
    table.Text("--port", port, "Port to listen at; 0: any that is free (default 8080)").Named("N");
    table
        .Text("--host", host,
              "Address or name of this machine to listen at (default 127.0.0.1: programs of this "
              "machine alone reach it)")
        .Named("ADDRESS");
    table.Flag("--open", open,
               "Show it in the browser: a single file at once, else all of them to choose from");
    table.Flag("--follow-links", followLinks, "Follow symbolic links that lead out of the folders");
    table
        .Text("--base-url", baseUrl,
              "What links begin with, where a proxy stands in front (default http:// and what the "
              "client calls the server)")
        .Named("URL");
    table.Text("--access-log", accessLog, "File for the access log (default stderr)").Named("FILE");
    table.Text("--threads", threads, "Threads that make answers (default one a processor)")
        .Named("N");
    table
        .Text("--queue", waiting,
              "Requests that may wait for a thread; more are refused with 503 (default 64)")
        .Named("N");
    table
        .Text("--connections", connections,
              "Connections at once (default 10000, or as many as open files allow)")
        .Named("N");
    table.Text("--idle", idle, "Seconds until a silent connection is ended (default 30)")
        .Named("S");
    table.Text("--time", time, "Seconds that an answer may take (default 30)").Named("S");
    table.Text("--max-pixels", pixels, "Pixels of a picture (default 16777216)").Named("N");
    table.Text("--max-side", side, "Pixels of its longer side (default 8192)").Named("N");
    table
        .Text("--max-window", window,
              "Bytes of samples that an answer holds, or is made of at once (default 64M)")
        .Named("SIZE");
    table.Footer(
        "Examples:\n"
        "  zmcraster serve scene.pyr --open\n"
        "  zmcraster serve /data/pyramids --port 8000\n"
        "  zmcraster serve /data --host 0.0.0.0 --access-log access.log\n"
        "\n"
        "Prints its address once it listens, and serves until it is interrupted. /api lists what "
        "is\n"
        "served and how. Folders are listed anew at each request. Whoever reaches the port can "
        "read\n"
        "all that is served, and so can every page that a browser on this machine shows.");
}

// A number of an option; what was there before where it is not given.
template <class T>
void Take(const char* option, const std::string& text, std::uint64_t least, std::uint64_t most,
          T& value) {
    if (text.empty()) return;
    const std::uint64_t number = ParseCount(option, text, most);
    if (number < least) throw UsageError(option, "it is " + std::to_string(least) + " at least");
    value = static_cast<T>(number);
}

void TakeSeconds(const char* option, const std::string& text, auto& value) {
    std::uint64_t seconds = 0;
    Take(option, text, 1, kMostSeconds, seconds);
    if (seconds != 0) value = std::chrono::seconds(seconds);
}

zmcserve::ServiceLimits ServeCommand::Limits() const {
    zmcserve::ServiceLimits limits;
    Take("--max-pixels", pixels, 1, std::uint64_t{1} << 32, limits.pixels);
    Take("--max-side", side, 1, 65535, limits.side);
    if (!window.empty()) limits.window = ParseSize("--max-window", window);
    TakeSeconds("--time", time, limits.time);
    return limits;
}

zmcserve::ServerOptions ServeCommand::Options() const {
    zmcserve::ServerOptions options;
    options.port = kUsualPort;
    Take("--port", port, 0, 65535, options.port);
    Take("--threads", threads, 1, 1024, options.threads);
    Take("--queue", waiting, 0, 1 << 20, options.waiting);
    Take("--connections", connections, 1, 1 << 20, options.connections);
    TakeSeconds("--idle", idle, options.idle);
    options.host = host;
    options.baseUrl = baseUrl;
    while (!options.baseUrl.empty() && options.baseUrl.back() == '/') options.baseUrl.pop_back();
    options.accessLog = accessLog;
    options.logs = !quiet || !accessLog.empty();
    return options;
}

void ServeCommand::Tell(const zmcserve::HttpServer& server) const {
    if (json)
        PrintDocument({{"schema", kSchema}, {"url", server.Url()}});
    else
        std::printf("%s\n", server.Url().c_str());
    if (std::fflush(stdout) != 0) throw Failure("standard output", "it cannot be written");
    if (!server.IsLocal()) Warn(host, "whoever reaches this address can read all that is served");
}

// The viewer, at the file where there is only one.
std::string ServeCommand::PageToOpen(const std::string& url, zmcserve::Service& service) const {
    const auto listing = service.catalog.List();
    const bool isOne = named.size() == 1 && listing.names.size() == 1 &&
                       listing.names[0] == platform::NameOf(named[0]);
    if (!isOne) return url;
    const std::string file = "files/" + zmcserve::PercentEncoded(listing.names[0]);
    return url + "?file=" + zmcserve::PercentEncoded(file, true);
}

ExitStatus ServeCommand::Run() {
    const zmcserve::ServiceLimits limits = Limits();
    const zmcserve::ServerOptions options = Options();
    zmcserve::Service service(named, followLinks, zmcgdal::SharedModule(), limits);
    const zmcserve::HttpServer server(service, options);
    Tell(server);
    if (open && !platform::OpenInBrowser(PageToOpen(server.Url(), service)))
        Warn(server.Url(), "no browser can be started");
    while (!platform::IsInterrupted()) std::this_thread::sleep_for(std::chrono::milliseconds(50));
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeServeCommand() { return std::make_unique<ServeCommand>(); }

}  // namespace zmctools
