#include "serve/HttpServer.h"

#include <microhttpd.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <unordered_set>
#include <utility>

#include "host/base/Error.h"
#include "host/base/Threads.h"
#include "platform/Interrupts.h"
#include "platform/Network.h"
#include "serve/AccessLog.h"
#include "serve/Compression.h"
#include "serve/WorkQueue.h"

namespace zmcserve {
namespace {

using Clock = std::chrono::steady_clock;

// Of a connection: the head of a request and that of its answer have to fit in.
constexpr std::size_t kConnectionBytes = std::size_t{24} << 10;
constexpr std::size_t kMostConnections = 10000;
// Files that are open beside connections: rasters, sidecars, logs.
constexpr std::size_t kSpareFiles = 512;
constexpr int kBacklog = 1024;
constexpr std::chrono::milliseconds kLook(500);

// One connection, as long as it is open.
struct Connection {
    std::string client;
    int descriptor = -1;
    std::atomic<bool> inRequest{false};
    std::atomic<Clock::rep> since{Clock::now().time_since_epoch().count()};

    // Begins to wait for the head of a request.
    void Rest() {
        since = Clock::now().time_since_epoch().count();
        inRequest = false;
    }
    Clock::duration Waiting() const {
        return inRequest ? Clock::duration::zero()
                         : Clock::now().time_since_epoch() - Clock::duration(since);
    }
};

// One request, from its first line to the end of its answer.
struct Exchange {
    explicit Exchange(std::string_view line) : target(line) {}

    enum class State { New, Judged, AtWork, Ready };

    std::string target;
    std::string method = "-";
    std::string protocol = "-";
    Clock::time_point begin = Clock::now();
    std::atomic<State> state{State::New};
    Request request;
    Answer answer;
    int status = 0;
    std::uint64_t bytes = 0;
};

Method MethodOf(std::string_view name) {
    if (name == "GET") return Method::Get;
    if (name == "HEAD") return Method::Head;
    return name == "OPTIONS" ? Method::Options : Method::Other;
}

MHD_Result TakeHeader(void* request, MHD_ValueKind, const char* key, const char* value) {
    auto& headers = static_cast<Request*>(request)->headers;
    if (headers.size() == Request::kMostHeaders) return MHD_NO;
    headers.emplace_back(key ? key : "", value ? value : "");
    return MHD_YES;
}

bool IsHost(std::string_view text) {
    return !text.empty() && text.size() < 256 && std::all_of(text.begin(), text.end(), [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') ||
               c == '.' || c == '-' || c == '_' || c == ':' || c == '[' || c == ']';
    });
}

// Names of headers are words without blanks. "Transfer-Encoding " is none, and somebody in front of
// the server could take it for one: then the two would not agree on where the next request begins.
bool HasOddHeader(const Request& request) {
    const auto isOdd = [](char c) {
        return c <= 0x20 || c == 0x7F ||
               std::string_view("()<>@,;:\\\"/[]?={}").find(c) != std::string_view::npos;
    };
    return std::any_of(request.headers.begin(), request.headers.end(), [&](const auto& header) {
        return header.first.empty() || std::any_of(header.first.begin(), header.first.end(), isOdd);
    });
}

// Bytes behind the head, which no request here has; what comes there could be taken for the next
// one.
bool HasBody(const Request& request) {
    const auto length = request.Header("Content-Length");
    return request.Header("Transfer-Encoding").has_value() || (length && Trimmed(*length) != "0");
}

// --- answers as the library has them ---

void FreeAnswer(void* held) { delete static_cast<Answer*>(held); }

MHD_Response* ResponseOfBytes(Answer&& answer) {
    auto held = std::make_unique<Answer>(std::move(answer));
    // The library only reads it.
    const auto bytes = [&](const auto& text) {
        return MHD_create_response_from_buffer_with_free_callback_cls(
            text.size(), const_cast<void*>(static_cast<const void*>(text.data())), FreeAnswer,
            held.get());
    };
    MHD_Response* made = nullptr;
    if (const auto* const text = std::get_if<std::string>(&held->body))
        made = bytes(*text);
    else if (const auto* const list = std::get_if<std::vector<unsigned char>>(&held->body))
        made = bytes(*list);
    else if (const auto* const shared = std::get_if<SharedText>(&held->body))
        made = bytes(**shared);
    if (made) static_cast<void>(held.release());
    return made;
}

// Short ranges are read and go out in one call with the head of the answer, which is quicker than
// sendfile: that has the head sent by itself, and wakes the client for it. What they take together
// is bounded, since slow clients may keep them for long; beyond that they are sent as long ones
// are.
constexpr std::uint64_t kShortRange = std::uint64_t{256} << 10;
constexpr std::uint64_t kMostHeld = std::uint64_t{32} << 20;
std::atomic<std::uint64_t> heldBytes{0};

class Held {
public:
    explicit Held(std::uint64_t count) : size(count) { heldBytes += size; }
    ~Held() { heldBytes -= size; }
    Held(const Held&) = delete;
    Held& operator=(const Held&) = delete;

private:
    const std::uint64_t size;
};

struct HeldRange {
    explicit HeldRange(std::uint64_t size) : held(size), bytes(new char[size]) {}
    const Held held;
    const std::unique_ptr<char[]> bytes;
};

void FreeRange(void* held) { delete static_cast<HeldRange*>(held); }

MHD_Response* ResponseOfShortRange(const FileRange& range) {
    auto held = std::make_unique<HeldRange>(range.size);
    if (range.file->ReadAt(range.offset, held->bytes.get(), range.size) != range.size)
        throw Refusal::Busy("the file cannot be read, or was cut");
    range.file->CheckUnchanged();
    MHD_Response* const made = MHD_create_response_from_buffer_with_free_callback_cls(
        range.size, held->bytes.get(), FreeRange, held.get());
    if (made) static_cast<void>(held.release());
    return made;
}

MHD_Response* ResponseOfRange(const FileRange& range) {
    if (range.size <= kShortRange && heldBytes + range.size <= kMostHeld)
        return ResponseOfShortRange(range);
    const int descriptor = range.file->Duplicate();
    if (descriptor < 0) throw Refusal::Busy("there are too many open files");
    MHD_Response* const made =
        MHD_create_response_from_fd_at_offset64(range.size, descriptor, range.offset);
    if (!made) platform::CloseDescriptor(descriptor);
    return made;
}

// Of 304: one without a length would be taken for that of what the client has.
MHD_Response* ResponseOfNothing() {
    const auto none = [](void*, std::uint64_t, char*, std::size_t) -> ssize_t {
        return MHD_CONTENT_READER_END_OF_STREAM;
    };
    MHD_Response* const made =
        MHD_create_response_from_callback(MHD_SIZE_UNKNOWN, 1, none, nullptr, nullptr);
    // The library would send the end of a body in chunks behind the head, and on a connection that
    // goes on that is taken for the next answer: so there are none, and the connection ends.
    if (made) MHD_set_response_options(made, MHD_RF_HTTP_1_0_COMPATIBLE_STRICT, MHD_RO_END);
    return made;
}

MHD_Response* ResponseOfBody(Answer&& answer) {
    if (answer.status == 304) return ResponseOfNothing();
    if (const auto* const range = std::get_if<FileRange>(&answer.body))
        return ResponseOfRange(*range);
    return ResponseOfBytes(std::move(answer));
}

MHD_Response* ResponseOf(Answer&& answer) {
    const std::string type = answer.type;
    const Headers headers = std::move(answer.headers);
    MHD_Response* const made = ResponseOfBody(std::move(answer));
    if (!made) return nullptr;
    if (!type.empty()) MHD_add_response_header(made, MHD_HTTP_HEADER_CONTENT_TYPE, type.c_str());
    for (const auto& [key, value] : headers)
        MHD_add_response_header(made, key.c_str(), value.c_str());
    return made;
}

std::size_t ConnectionsFor(std::size_t wanted) {
    const std::size_t files = platform::RaiseOpenFiles();
    // A file that is sent has a number of its own.
    const std::size_t most = files > 2 * kSpareFiles ? (files - kSpareFiles) / 2 : files / 4;
    return std::max<std::size_t>(std::min(wanted == 0 ? kMostConnections : wanted, most), 1);
}

}  // namespace

class HttpServer::Server {
public:
    Server(Service& shared, const ServerOptions& chosen);
    ~Server();

    std::string url;
    bool isLocal = false;

private:
    Service& service;
    const ServerOptions options;
    const std::size_t threads;
    std::unique_ptr<AccessLog> log;
    std::atomic<bool> ending{false};    // no new work is taken
    std::atomic<bool> dropping{false};  // none is finished either
    std::mutex mutex;  // guards `open`, and that no descriptor in it is closed meanwhile
    std::unordered_set<Connection*> open;
    MHD_Daemon* daemon = nullptr;
    std::unique_ptr<WorkQueue> work;
    std::mutex restMutex;
    std::condition_variable rest;
    std::thread watcher;

    static MHD_Result Access(void* self, MHD_Connection* connection, const char* target,
                             const char* method, const char* version, const char* data,
                             std::size_t* size, void** exchange);
    static void* Begin(void* self, const char* target, MHD_Connection* connection);
    static void End(void* self, MHD_Connection* connection, void** exchange,
                    MHD_RequestTerminationCode code);
    static void Notify(void* self, MHD_Connection* connection, void** held,
                       MHD_ConnectionNotificationCode code);
    static std::size_t KeepEscapes(void*, MHD_Connection*, char* text) {
        return std::string_view(text).size();
    }

    void Start(const platform::Listener& listener);
    MHD_Result Take(MHD_Connection* connection, Exchange& exchange);
    MHD_Result Judge(MHD_Connection* connection, Exchange& exchange);
    MHD_Result TakeJudged(MHD_Connection* connection, Exchange& exchange);
    void FillIn(MHD_Connection* connection, Exchange& exchange) const;
    void Work(MHD_Connection* connection, Exchange& exchange);
    MHD_Result Send(MHD_Connection* connection, Exchange& exchange, Answer answer) const;
    void Note(const Connection* connection, const Exchange& exchange) const;
    void Watch();
    void EndSilentOnes();
};

// --- one request ---

void* HttpServer::Server::Begin(void*, const char* target, MHD_Connection*) try {
    return new Exchange(target);
} catch (const std::bad_alloc&) {
    return nullptr;
}

Connection* ConnectionOf(MHD_Connection* connection) {
    const auto* const info =
        MHD_get_connection_info(connection, MHD_CONNECTION_INFO_SOCKET_CONTEXT);
    return info ? static_cast<Connection*>(info->socket_context) : nullptr;
}

MHD_Result HttpServer::Server::Access(void* self, MHD_Connection* connection, const char*,
                                      const char* method, const char* version, const char*,
                                      std::size_t* size, void** held) {
    auto* const exchange = static_cast<Exchange*>(*held);
    if (!exchange) return MHD_NO;
    // Of a body that came all the same.
    *size = 0;
    try {
        if (exchange->state == Exchange::State::New) {
            exchange->method = method;
            exchange->protocol = version;
        }
        return static_cast<Server*>(self)->Take(connection, *exchange);
    } catch (const std::bad_alloc&) {
        return MHD_NO;
    }
}

MHD_Result HttpServer::Server::Take(MHD_Connection* connection, Exchange& exchange) {
    switch (exchange.state.load()) {
        case Exchange::State::New:
            return Judge(connection, exchange);
        case Exchange::State::Judged:
            return TakeJudged(connection, exchange);
        case Exchange::State::AtWork:
            return MHD_YES;
        default:
            return Send(connection, exchange, std::move(exchange.answer));
    }
}

void HttpServer::Server::FillIn(MHD_Connection* connection, Exchange& exchange) const {
    exchange.request = Request::Parse(MethodOf(exchange.method), exchange.target);
    Request& request = exchange.request;
    const int count = MHD_get_connection_values(connection, MHD_HEADER_KIND, &TakeHeader, &request);
    if (count < 0 || request.headers.size() >= Request::kMostHeaders)
        throw Refusal(431, "the request has too many headers");
    if (HasOddHeader(request)) throw Refusal(400, "a header has a name that none can have");
    if (HasBody(request) && request.method != Method::Other)
        throw Refusal(413, "requests with a body are not taken");
    if (HasBody(request)) throw Refusal(405, kOtherMethods).With("Allow", kMethods);
    request.deadline = Deadline(service.limits.time, &dropping);
    const std::string host = request.Header("Host").value_or("");
    request.baseUrl = !options.baseUrl.empty() ? options.baseUrl
                      : IsHost(host)           ? "http://" + host
                                               : url.substr(0, url.size() - 1);
    // Tags of compressed forms are those of what they are forms of.
    for (auto& [key, value] : request.headers)
        if (SameWord(key, "If-None-Match")) value = WithoutCodings(value);
}

// The library calls once with the head, and again when the request is whole. An answer to the first
// call ends the connection: where the next request would begin is not certain then.
MHD_Result HttpServer::Server::Judge(MHD_Connection* connection, Exchange& exchange) {
    if (Connection* const held = ConnectionOf(connection)) held->inRequest = true;
    try {
        FillIn(connection, exchange);
    } catch (...) {
        return Send(connection, exchange, Finished(AnswerOfException()));
    }
    exchange.state = Exchange::State::Judged;
    return MHD_YES;
}

MHD_Result HttpServer::Server::TakeJudged(MHD_Connection* connection, Exchange& exchange) {
    // Nobody waits behind more of them than may wait for workers.
    exchange.request.mayCompute =
        !ending && service.metrics.connections <= threads + options.waiting;
    if (auto quick = service.router.HandleQuickly(exchange.request, service))
        return Send(connection, exchange, std::move(*quick));
    if (ending || !work->Reserve()) {
        ++service.metrics.refusedAsBusy;
        return Send(connection, exchange,
                    Finished(ToAnswer(Refusal::Busy("too many requests wait already"))));
    }
    exchange.state = Exchange::State::AtWork;
    MHD_suspend_connection(connection);
    work->Add([this, connection, &exchange] { Work(connection, exchange); });
    return MHD_YES;
}

void HttpServer::Server::Work(MHD_Connection* connection, Exchange& exchange) {
    try {
        exchange.request.deadline.Check();
        exchange.answer = service.Handle(exchange.request);
        Compress(exchange.request, service.limits.compressed, exchange.answer);
    } catch (...) {
        exchange.answer = AnswerOfException();
    }
    exchange.state = Exchange::State::Ready;
    MHD_resume_connection(connection);
}

MHD_Result HttpServer::Server::Send(MHD_Connection* connection, Exchange& exchange,
                                    Answer answer) const {
    if (ending) answer.Set("Connection", "close");
    exchange.status = answer.status;
    exchange.bytes = exchange.request.method == Method::Head ? 0 : answer.Size();
    MHD_Response* response = nullptr;
    try {
        response = ResponseOf(std::move(answer));
    } catch (const Refusal& refusal) {
        exchange.status = refusal.Status();
        response = ResponseOf(ToAnswer(refusal));
    }
    if (!response) return MHD_NO;
    const MHD_Result queued =
        MHD_queue_response(connection, static_cast<unsigned>(exchange.status), response);
    MHD_destroy_response(response);
    return queued;
}

void HttpServer::Server::Note(const Connection* connection, const Exchange& exchange) const {
    const auto time = Clock::now() - exchange.begin;
    service.metrics.Answered(exchange.status, exchange.bytes, time);
    if (!log) return;
    log->Add({connection ? connection->client : "-", exchange.method, exchange.target,
              exchange.protocol, exchange.status, exchange.bytes,
              std::chrono::duration_cast<std::chrono::microseconds>(time)});
}

// What the library answered by itself: to a head that is malformed or too long, before anybody here
// is asked. 0 where nothing was answered.
int StatusOfLibrary(MHD_Connection* connection) {
    const auto* const info = MHD_get_connection_info(connection, MHD_CONNECTION_INFO_HTTP_STATUS);
    return info ? static_cast<int>(info->http_status) : 0;
}

void HttpServer::Server::End(void* self, MHD_Connection* connection, void** held,
                             MHD_RequestTerminationCode) {
    const std::unique_ptr<Exchange> exchange(static_cast<Exchange*>(std::exchange(*held, nullptr)));
    Connection* const from = ConnectionOf(connection);
    if (from) from->Rest();
    if (!exchange) return;
    if (exchange->status == 0) exchange->status = StatusOfLibrary(connection);
    try {
        static_cast<Server*>(self)->Note(from, *exchange);
    } catch (const std::bad_alloc&) {
        ++static_cast<Server*>(self)->service.metrics.lostLogLines;
    }
}

// --- connections ---

void HttpServer::Server::Notify(void* self, MHD_Connection* connection, void** held,
                                MHD_ConnectionNotificationCode code) {
    Server& server = *static_cast<Server*>(self);
    if (code == MHD_CONNECTION_NOTIFY_STARTED) try {
            auto made = std::make_unique<Connection>();
            if (const auto* const socket =
                    MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CONNECTION_FD))
                made->descriptor = socket->connect_fd;
            if (const auto* const address =
                    MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CLIENT_ADDRESS))
                made->client = platform::AddressText(address->client_addr);
            const std::lock_guard lock(server.mutex);
            server.open.insert(made.get());
            ++server.service.metrics.connections;
            *held = made.release();
        } catch (const std::bad_alloc&) {
            *held = nullptr;
        }
    if (code != MHD_CONNECTION_NOTIFY_CLOSED || !*held) return;
    const std::unique_ptr<Connection> gone(static_cast<Connection*>(std::exchange(*held, nullptr)));
    const std::lock_guard lock(server.mutex);
    server.open.erase(gone.get());
    --server.service.metrics.connections;
}

// The library ends connections on which nothing moves. One that sends a byte now and then would
// hold its place for ever; so the whole head of a request has to come within the same time.
void HttpServer::Server::EndSilentOnes() {
    const std::lock_guard lock(mutex);
    for (const Connection* const each : open)
        if (each->Waiting() > options.idle) platform::EndConnection(each->descriptor);
}

void HttpServer::Server::Watch() {
    std::unique_lock lock(restMutex);
    while (!rest.wait_for(lock, kLook, [this] { return ending.load(); })) EndSilentOnes();
}

// --- the server ---

HttpServer::Server::Server(Service& shared, const ServerOptions& chosen)
    : service(shared),
      options(chosen),
      threads(chosen.threads == 0 ? zmchost::AvailableThreads() : chosen.threads) {
    if (options.logs) log = std::make_unique<AccessLog>(options.accessLog, service.metrics);
    platform::IgnoreBrokenPipes();
    const platform::Listener listener = platform::Listen(options.host, options.port, kBacklog);
    if (listener.descriptor < 0)
        throw zmchost::Error(options.host + ":" + std::to_string(options.port), "listen there",
                             listener.problem);
    const bool six = listener.address.find(':') != listener.address.npos;
    url = "http://" + (six ? "[" + listener.address + "]" : listener.address) + ":" +
          std::to_string(listener.port) + "/";
    isLocal = platform::IsLoopback(listener.address);
    work = std::make_unique<WorkQueue>(threads, options.waiting, service.metrics);
    Start(listener);
    watcher = std::thread([this] { Watch(); });
}

void HttpServer::Server::Start(const platform::Listener& listener) {
    const auto flags = MHD_USE_EPOLL_INTERNAL_THREAD | MHD_ALLOW_SUSPEND_RESUME;
    daemon = MHD_start_daemon(
        flags, 0, nullptr, nullptr, &Server::Access, this, MHD_OPTION_LISTEN_SOCKET,
        listener.descriptor, MHD_OPTION_THREAD_POOL_SIZE,
        static_cast<unsigned>(std::max<std::size_t>(threads, 2)), MHD_OPTION_CONNECTION_LIMIT,
        static_cast<unsigned>(ConnectionsFor(options.connections)), MHD_OPTION_CONNECTION_TIMEOUT,
        static_cast<unsigned>(options.idle.count()), MHD_OPTION_CONNECTION_MEMORY_LIMIT,
        kConnectionBytes, MHD_OPTION_URI_LOG_CALLBACK, &Server::Begin, this,
        MHD_OPTION_UNESCAPE_CALLBACK, &Server::KeepEscapes, nullptr, MHD_OPTION_NOTIFY_COMPLETED,
        &Server::End, this, MHD_OPTION_NOTIFY_CONNECTION, &Server::Notify, this,
        MHD_OPTION_STRICT_FOR_CLIENT, 1, MHD_OPTION_SIGPIPE_HANDLED_BY_APP, 1, MHD_OPTION_END);
    if (daemon) return;
    platform::CloseDescriptor(listener.descriptor);
    throw zmchost::Error(url, "answer requests", "the HTTP library does not start");
}

HttpServer::Server::~Server() {
    {
        const std::lock_guard lock(restMutex);
        ending = true;
    }
    rest.notify_one();
    watcher.join();
    const int listening = MHD_quiesce_daemon(daemon);
    if (listening >= 0) platform::CloseDescriptor(listening);
    const auto end = Clock::now() + options.ending;
    const auto isBusy = [this] {
        const std::lock_guard lock(mutex);
        return std::any_of(open.begin(), open.end(),
                           [](const Connection* each) { return each->inRequest.load(); });
    };
    while (isBusy() && Clock::now() < end)
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    // The library wants no connection at rest when it ends.
    dropping = true;
    work.reset();
    MHD_stop_daemon(daemon);
}

HttpServer::HttpServer(Service& service, const ServerOptions& options)
    : server(std::make_unique<Server>(service, options)) {}

HttpServer::~HttpServer() = default;

const std::string& HttpServer::Url() const { return server->url; }

bool HttpServer::IsLocal() const { return server->isLocal; }

}  // namespace zmcserve
