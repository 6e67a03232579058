// HttpServer: a Service behind a socket.
//
// The library libmicrohttpd reads requests and sends answers on a few threads of its own, which
// wait for all connections at once. What takes no more than a few calls of the system is answered
// there: files, and raw tiles of an open raster; and small JPEG tiles while few connections are
// open. All other requests wait for a worker, and where too many wait they are refused with 503, so
// that the others are still answered soon.
//
// libmicrohttpd was chosen because it does just this much: it waits by epoll, sends ranges of files
// by sendfile, lets a connection rest while others work for it, holds limits on connections, memory
// and time, is a small C library that distributions keep safe, and its licence allows linking.
// Boost.Beast leaves all of this to be written; cpp-httplib and civetweb keep a thread for each
// connection, which ten thousand of them would not bear; libevent has no limits on what a request
// takes.
#ifndef ZMC_SERVE_HTTPSERVER_H
#define ZMC_SERVE_HTTPSERVER_H

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "serve/Service.h"

namespace zmcserve {

struct ServerOptions {
    std::string host = "127.0.0.1";
    std::uint16_t port = 0;  // 0: any that is free
    // What links in answers begin with, without a slash at the end; empty: "http://" and what the
    // request calls the server.
    std::string baseUrl;
    std::size_t threads = 0;          // workers, and as many that send; 0: one a processor
    std::size_t waiting = 64;         // requests that may wait for a worker
    std::size_t connections = 0;      // 0: as many as there may be open files, up to 10,000
    std::chrono::seconds idle{30};    // until a connection that is silent is ended
    std::chrono::seconds ending{10};  // for what is under way when the server ends
    std::string accessLog;            // a file; empty: stderr
    bool logs = true;
};

class HttpServer {
public:
    // Listens, and answers from now on. The service is borrowed. Throws zmchost::Error.
    HttpServer(Service& service, const ServerOptions& options);
    // Takes no more connections, waits for what is under way, and ends the rest.
    ~HttpServer();
    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    // "http://127.0.0.1:8080/"
    const std::string& Url() const;
    // Whether only this machine can reach it.
    bool IsLocal() const;

private:
    class Server;
    std::unique_ptr<Server> server;
};

}  // namespace zmcserve

#endif
