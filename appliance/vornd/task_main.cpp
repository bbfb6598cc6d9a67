#include "appliance/vornd/task_main.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <memory>
#include <optional>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/platform/webapi/exchange.h"
#include "appliance/platform/webapi/framework_codes.h"
#include "appliance/platform/webapi/task_store.h"
#include "appliance/vornd/module.h"

namespace appliance {
namespace {

constexpr char kBegun = 'b';
constexpr char kAnswered = 'a';
constexpr int kFirstAnswerWait = 500;  // milliseconds
constexpr int kEndAttempts = 10;
constexpr std::chrono::milliseconds kEndPause{500};

struct Body {
    std::unique_ptr<Module> module;
    VORN::APITaskFunction function = nullptr;
};

// Claims the record and loads the body. Nothing, and a line in the log, when that can't be.
std::optional<Body> Begin(TaskStore& store, const TaskRecord& record) {
    const std::string name = "background task " + record.id + ": ";
    if (!store.Claim(record.id, ProcessIdentity::OfCaller())) {
        Log(LOG_NOTICE, name + "not to be run any more");
        return std::nullopt;
    }
    Body body;
    std::string reason;
    body.module = Module::Load(record.task.module, reason);
    if (!body.module) {
        Log(LOG_ERR, name + reason);
        return std::nullopt;
    }
    body.function = body.module->FindTask(record.task.symbol);
    if (body.function == nullptr) {
        Log(LOG_ERR, name + "module " + record.task.module + " exports no " + record.task.symbol);
        return std::nullopt;
    }
    return body;
}

// False when nobody listens any more.
bool Tell(const FileDescriptor& waiting, char word) {
    return waiting && write(waiting.get(), &word, 1) == 1;
}

// What the task's body left as its result. No answer at all is a failure.
TaskEnd EndOf(const VORN::APIResponse& response) {
    TaskEnd end;
    if (!response.impl->answered) {
        end.code = static_cast<int>(FrameworkCode::TaskWithoutResult);
        return end;
    }
    end.success = response.impl->success;
    end.data = response.impl->data;
    if (!end.success) {
        end.code = response.impl->code;
        end.errors = response.impl->errors;
    }
    return end;
}

// The first answer is told to the one that waits for it.
TaskEnd Call(const Body& body, TaskStore& store, const TaskHost& host, const TaskRecord& record,
             FileDescriptor& waiting) {
    const std::string name = "background task " + record.id + ": ";
    VORN::APIRequest request;
    VORN::APIResponse response;
    request.impl->parameters = record.task.parameters;
    request.impl->taskHost = &host;
    response.impl->published = [&](const Json::Value& data) {
        try {
            store.Publish(record.id, data);
        } catch (const SqliteError& error) {
            Log(LOG_ERR, name + "its progress is not kept: " + error.what());
        }
        Tell(waiting, kAnswered);
        waiting.Reset();
    };
    TaskEnd failed;
    failed.code = static_cast<int>(FrameworkCode::TaskException);
    try {
        body.function(&request, &response, nullptr);
        return EndOf(response);
    } catch (const std::exception& error) {
        Log(LOG_ERR, name + "an exception left its body: " + error.what());
    } catch (...) {
        Log(LOG_ERR, name + "an exception of unknown type left its body");
    }
    return failed;
}

// A full disk may have room again in a moment. Without an end the record counts as one of a task without a result.
int KeepEnd(TaskStore& store, const std::string& id, const TaskEnd& end) {
    for (int attempt = 0; attempt < kEndAttempts; ++attempt) {
        try {
            store.End(id, end);
            return 0;
        } catch (const SqliteError& error) {
            Log(LOG_ERR, "background task " + id + ": its end is not kept: " + error.what());
            std::this_thread::sleep_for(kEndPause);
        }
    }
    return 1;
}

// The task's process: its words go to the one that forked it.
int Work(FileDescriptor waiting, const TaskHost& host, const std::string& id) {
    setsid();
    try {
        TaskStore store(host.database);
        const std::optional<TaskRecord> record = store.Find(id);
        if (!record) {
            Log(LOG_ERR, "background task " + id + ": there is no such record");
            return 1;
        }
        const std::optional<Body> body = Begin(store, *record);
        if (!body || !Tell(waiting, kBegun)) {
            return 1;
        }
        return KeepEnd(store, id, Call(*body, store, host, *record, waiting));
    } catch (const std::exception& error) {
        Log(LOG_ERR, "background task " + id + ": " + error.what());
        return 1;
    }
}

}  // namespace

int RunTask(const TaskHost& host, const std::string& id) {
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        Log(LOG_ERR, "background task " + id + ": " + std::strerror(errno));
        return 1;
    }
    FileDescriptor reading(ends[0]);
    FileDescriptor writing(ends[1]);
    const pid_t pid = fork();
    if (pid < 0) {
        Log(LOG_ERR, "background task " + id + ": " + std::strerror(errno));
        return 1;
    }
    if (pid == 0) {
        reading.Reset();
        return Work(std::move(writing), host, id);
    }
    writing.Reset();
    char word = 0;
    ssize_t got = 0;
    while ((got = read(reading.get(), &word, 1)) < 0 && errno == EINTR) {
    }
    if (got != 1 || word != kBegun) {
        return 1;
    }
    // Whoever asks for the status next finds the task's first answer. A body that has none for long is not waited for.
    pollfd answered{reading.get(), POLLIN, 0};
    poll(&answered, 1, kFirstAnswerWait);
    return 0;
}

}  // namespace appliance
