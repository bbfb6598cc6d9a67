#include "appliance/domain/directory/worker.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/writer.h>
#include <poll.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <csignal>
#include <cstring>
#include <memory>
#include <sstream>
#include <string_view>
#include <system_error>

#include "appliance/base/child_process.h"
#include "appliance/base/sqlite.h"

namespace appliance {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kTellInterval{100};
constexpr std::size_t kLongestAnswer = std::size_t{4} << 20;

Json::Value Failure(ErrorCode code, const char* reason) {
    Json::Value answer;
    answer["code"] = static_cast<int>(code);
    answer["reason"] = reason;
    return answer;
}

// The child's whole life after the fork. It leaves without running what the parent registered for its own end.
[[noreturn]] void LiveAsChild(int descriptor, pid_t parent, const std::function<Json::Value(ProgressReport&)>& work) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) {
        _exit(1);  // the parent died before it could be watched
    }
    for (const int number : {SIGTERM, SIGINT, SIGHUP, SIGQUIT, SIGCHLD, SIGALRM}) {
        std::signal(number, SIG_DFL);
    }
    std::signal(SIGPIPE, SIG_IGN);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);

    Json::Value answer;
    try {
        ProgressReport report(descriptor);
        Json::Value result = work(report);
        answer["result"] = std::move(result);
    } catch (const DirectoryError& error) {
        answer = Failure(error.code(), error.what());
    } catch (const std::bad_alloc&) {
        answer = Failure(ErrorCode::OutOfMemory, "out of memory");
    } catch (const SqliteError& error) {
        answer = Failure(ErrorCode::Database, error.what());
    } catch (const std::system_error& error) {
        answer = Failure(ErrorCode::FileWrite, error.what());
    } catch (const std::exception& error) {
        answer = Failure(ErrorCode::Internal, error.what());
    }
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    WriteAll(descriptor, "=" + Json::writeString(form, answer) + "\n");
    _exit(0);
}

Json::Value ResultOf(const std::string& line) {
    Json::Value answer;
    Json::CharReaderBuilder form;
    std::istringstream stream(line);
    if (!Json::parseFromStream(form, stream, &answer, nullptr) || !answer.isObject()) {
        throw DirectoryError(ErrorCode::Internal, "the helper process gave no usable answer");
    }
    if (!answer.isMember("result")) {
        throw DirectoryError(static_cast<ErrorCode>(answer["code"].asInt()), answer["reason"].asString());
    }
    return answer["result"];
}

std::string Seconds(std::chrono::milliseconds time) {
    return std::to_string((time.count() + 999) / 1000) + " s";
}

}  // namespace

void ProgressReport::Tell(std::int64_t count) {
    const Clock::time_point now = Clock::now();
    if (now - told_ < kTellInterval) {
        return;
    }
    told_ = now;
    if (WriteAll(descriptor_, "+" + std::to_string(count) + "\n")) {
        _exit(1);
    }
}

Json::Value RunWorker(const Patience& patience, const std::function<Json::Value(ProgressReport&)>& work,
                      const std::function<void(std::int64_t)>& progress) {
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        throw DirectoryError(ErrorCode::Internal, std::string("no pipe for a helper process: ") + strerror(errno));
    }
    FileDescriptor reading(ends[0]);
    FileDescriptor writing(ends[1]);
    const pid_t parent = getpid();
    const pid_t pid = fork();
    if (pid < 0) {
        throw DirectoryError(ErrorCode::Internal, std::string("no helper process: ") + strerror(errno));
    }
    if (pid == 0) {
        reading.Reset();
        LiveAsChild(writing.get(), parent, work);
    }
    ChildProcess child(pid);
    writing.Reset();

    const Clock::time_point end = Clock::now() + patience.overall;
    Clock::time_point silent = Clock::now() + patience.silence;
    std::string text;
    std::array<char, 4096> buffer{};
    for (;;) {
        const Clock::time_point now = Clock::now();
        if (now >= silent) {
            throw DirectoryError(ErrorCode::TimedOut, "no progress for " + Seconds(patience.silence));
        }
        if (now >= end) {
            throw DirectoryError(ErrorCode::TimedOut, "not done within " + Seconds(patience.overall));
        }
        pollfd wait{reading.get(), POLLIN, 0};
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(std::min(silent, end) - now).count() + 1;
        const int ready = poll(&wait, 1, static_cast<int>(std::min<std::int64_t>(left, 60000)));
        if (ready <= 0) {
            continue;
        }
        const ssize_t got = read(reading.get(), buffer.data(), buffer.size());
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got <= 0) {
            break;
        }
        text.append(buffer.data(), static_cast<std::size_t>(got));
        if (text.size() > kLongestAnswer) {
            throw DirectoryError(ErrorCode::Internal, "the helper process said too much");
        }
        for (std::size_t line = text.find('\n'); line != std::string::npos; line = text.find('\n')) {
            const std::string words = text.substr(0, line);
            text.erase(0, line + 1);
            if (!words.empty() && words.front() == '=') {
                child.Wait();
                return ResultOf(words.substr(1));
            }
            std::int64_t count = 0;
            if (!words.empty() &&
                std::from_chars(words.data() + 1, words.data() + words.size(), count).ec == std::errc()) {
                silent = Clock::now() + patience.silence;
                if (progress) {
                    progress(count);
                }
            }
        }
    }
    const ChildEnd ended = child.Wait();
    throw DirectoryError(ErrorCode::CommandFailed,
                         ended.how == ChildEnd::How::Signalled
                             ? "the helper process was ended by signal " + std::to_string(ended.code)
                             : "the helper process ended without an answer");
}

}  // namespace appliance
