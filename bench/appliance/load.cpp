// Calls one method again and again over connections that are kept, through the page's door or on the server's socket,
// and tells how many calls were answered and how long they took.

#include <getopt.h>
#include <netdb.h>
#include <openssl/ssl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace {

using Clock = std::chrono::steady_clock;

constexpr const char* kUsage =
    "usage: load --unix PATH | --tls HOST:PORT [--cookie TEXT] [--csrf TEXT]\n"
    "            [--target PATH] [--connections N] [--seconds N] [--rate CALLS_PER_SECOND]\n"
    "With a rate the calls have their times, and one that starts late counts from when it was due.\n";

constexpr time_t kDeadline = 30;  // seconds, for one answer

struct Options {
    std::string unixPath;
    std::string host;
    std::string port;
    std::string cookie;
    std::string csrf;
    std::string target = "/webapi/VORN.Core.Directory.Domain/1/get";
    int connections = 4;
    double seconds = 5;
    double rate = 0;  // in all; 0: as fast as they are answered
};

struct Results {
    std::vector<double> seconds;  // of each call that was answered as it should be
    std::size_t failed = 0;
    std::string firstFailure;
};

class Socket {
public:
    explicit Socket(const Options& options) : descriptor_(options.unixPath.empty() ? Tcp(options) : Unix(options)) {
        const timeval limit{kDeadline, 0};
        setsockopt(descriptor_, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof limit);
        setsockopt(descriptor_, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
    }
    ~Socket() {
        close(descriptor_);
    }
    Socket(const Socket&) = delete;
    Socket& operator=(const Socket&) = delete;

    int get() const {
        return descriptor_;
    }

private:
    static int Unix(const Options& options) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        if (options.unixPath.size() >= sizeof address.sun_path) {
            throw std::runtime_error("the socket's path is too long");
        }
        std::memcpy(address.sun_path, options.unixPath.c_str(), options.unixPath.size() + 1);
        const int made = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (made < 0 || connect(made, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
            throw std::runtime_error("no connection to " + options.unixPath);
        }
        return made;
    }

    static int Tcp(const Options& options) {
        addrinfo hints{};
        hints.ai_socktype = SOCK_STREAM;
        addrinfo* found = nullptr;
        if (getaddrinfo(options.host.c_str(), options.port.c_str(), &hints, &found) != 0) {
            throw std::runtime_error("no such address: " + options.host);
        }
        const std::unique_ptr<addrinfo, decltype(&freeaddrinfo)> owner(found, freeaddrinfo);
        const int made = socket(found->ai_family, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (made < 0 || connect(made, found->ai_addr, found->ai_addrlen) != 0) {
            throw std::runtime_error("no connection to " + options.host + ":" + options.port);
        }
        return made;
    }

    const int descriptor_;
};

struct FreeTls {
    void operator()(SSL_CTX* context) const {
        SSL_CTX_free(context);
    }
    void operator()(SSL* session) const {
        SSL_free(session);
    }
};

// One kept connection.
class Connection {
public:
    explicit Connection(const Options& options) : socket_(options) {
        if (options.unixPath.empty()) {
            context_.reset(SSL_CTX_new(TLS_client_method()));
            tls_.reset(SSL_new(context_.get()));
            if (!tls_ || SSL_set_fd(tls_.get(), socket_.get()) != 1 || SSL_connect(tls_.get()) != 1) {
                throw std::runtime_error("no TLS with " + options.host);
            }
        }
    }

    // Seconds that it took. Throws when there is no answer, or another one than a success.
    double Call(const std::string& request, Clock::time_point begin) {
        Send(request);
        std::string received;
        std::size_t body = std::string::npos;
        while ((body = received.find("\r\n\r\n")) == std::string::npos) {
            Receive(received);
        }
        body += 4;
        const std::size_t field = received.find("Content-Length: ");
        if (field == std::string::npos || field > body) {
            throw std::runtime_error("an answer without a length");
        }
        const std::size_t length =
            std::strtoul(received.c_str() + field + std::strlen("Content-Length: "), nullptr, 10);
        while (received.size() < body + length) {
            Receive(received);
        }
        const std::chrono::duration<double> took = Clock::now() - begin;
        if (received.compare(0, 12, "HTTP/1.1 200") != 0 ||
            received.find("\"success\":true", body) == std::string::npos) {
            throw std::runtime_error("answered with " + received.substr(0, received.find('\r')));
        }
        return took.count();
    }

private:
    void Send(const std::string& request) {
        const auto size = static_cast<int>(request.size());
        const bool sent = tls_ ? SSL_write(tls_.get(), request.data(), size) == size
                               : send(socket_.get(), request.data(), request.size(), MSG_NOSIGNAL) == size;
        if (!sent) {
            throw std::runtime_error("a request could not be sent");
        }
    }

    void Receive(std::string& to) {
        char piece[16384];
        const long got = tls_ ? SSL_read(tls_.get(), piece, sizeof piece) : recv(socket_.get(), piece, sizeof piece, 0);
        if (got <= 0) {
            throw std::runtime_error("the connection was closed");
        }
        to.append(piece, static_cast<std::size_t>(got));
    }

    const Socket socket_;
    std::unique_ptr<SSL_CTX, FreeTls> context_;
    std::unique_ptr<SSL, FreeTls> tls_;
};

std::string RequestOf(const Options& options) {
    std::string request = "POST " + options.target + " HTTP/1.1\r\nHost: " +
                          (options.host.empty() ? "localhost" : options.host + ":" + options.port) +
                          "\r\nContent-Type: application/json\r\nContent-Length: 2\r\n";
    if (!options.cookie.empty()) {
        request += "Cookie: " + options.cookie + "\r\n";
    }
    if (!options.csrf.empty()) {
        request += "X-CSRF-Token: " + options.csrf + "\r\n";
    }
    return request + "\r\n{}";
}

// The calls of one connection; with a rate those that are its share.
Results Run(const Options& options, int which, Clock::time_point start) {
    Results results;
    const std::string request = RequestOf(options);
    const auto end =
        start + std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(options.seconds));
    try {
        Connection connection(options);
        std::this_thread::sleep_until(start);
        for (int call = 0; Clock::now() < end; ++call) {
            Clock::time_point due = Clock::now();
            if (options.rate > 0) {
                const std::chrono::duration<double> after((call * options.connections + which) / options.rate);
                due = start + std::chrono::duration_cast<Clock::duration>(after);
                if (due >= end) {
                    break;
                }
                std::this_thread::sleep_until(due);
            }
            results.seconds.push_back(connection.Call(request, due));
        }
    } catch (const std::exception& error) {
        ++results.failed;
        results.firstFailure = error.what();
    }
    return results;
}

bool ReadOptions(int count, char** arguments, Options& options) {
    static const option kLong[] = {{"unix", required_argument, nullptr, 'u'},
                                   {"tls", required_argument, nullptr, 't'},
                                   {"cookie", required_argument, nullptr, 'c'},
                                   {"csrf", required_argument, nullptr, 'x'},
                                   {"target", required_argument, nullptr, 'p'},
                                   {"connections", required_argument, nullptr, 'n'},
                                   {"seconds", required_argument, nullptr, 's'},
                                   {"rate", required_argument, nullptr, 'r'},
                                   {nullptr, 0, nullptr, 0}};
    for (int letter = 0; (letter = getopt_long(count, arguments, "", kLong, nullptr)) != -1;) {
        const std::string text = optarg == nullptr ? "" : optarg;
        switch (letter) {
            case 'u':
                options.unixPath = text;
                break;
            case 't':
                options.host = text.substr(0, text.rfind(':'));
                options.port = text.substr(text.rfind(':') + 1);
                break;
            case 'c':
                options.cookie = text;
                break;
            case 'x':
                options.csrf = text;
                break;
            case 'p':
                options.target = text;
                break;
            case 'n':
                options.connections = std::atoi(optarg);
                break;
            case 's':
                options.seconds = std::atof(optarg);
                break;
            case 'r':
                options.rate = std::atof(optarg);
                break;
            default:
                return false;
        }
    }
    return optind == count && options.unixPath.empty() != options.host.empty() && options.connections > 0 &&
           options.seconds > 0;
}

void Print(const std::vector<Results>& all, double seconds) {
    std::vector<double> calls;
    std::size_t failed = 0;
    for (const Results& results : all) {
        calls.insert(calls.end(), results.seconds.begin(), results.seconds.end());
        failed += results.failed;
        if (results.failed > 0) {
            std::fprintf(stderr, "load: %s\n", results.firstFailure.c_str());
        }
    }
    std::sort(calls.begin(), calls.end());
    const auto at = [&calls](double part) {
        return calls.empty() ? 0.0 : calls[static_cast<std::size_t>(part * static_cast<double>(calls.size() - 1))];
    };
    std::printf("{\"calls\": %zu, \"failed\": %zu, \"seconds\": %.3f, \"p50\": %.6f, \"p99\": %.6f, \"most\": %.6f}\n",
                calls.size(), failed, seconds, at(0.5), at(0.99), at(1));
}

}  // namespace

int main(int count, char** arguments) {
    Options options;
    if (!ReadOptions(count, arguments, options)) {
        std::fputs(kUsage, stderr);
        return 2;
    }
    std::vector<Results> results(static_cast<std::size_t>(options.connections));
    std::vector<std::thread> threads;
    // Connections are made before it begins.
    const auto start = Clock::now() + std::chrono::milliseconds(300);
    for (int which = 0; which < options.connections; ++which) {
        threads.emplace_back([&, which] { results[static_cast<std::size_t>(which)] = Run(options, which, start); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    const std::chrono::duration<double> took = Clock::now() - start;
    Print(results, took.count());
    return 0;
}
