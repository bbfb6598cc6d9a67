// Background tasks as a module starts and follows them: each is a process of its own.

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <signal.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <thread>
#include <utility>

#include "appliance/platform/webapi/exchange.h"
#include "appliance/platform/webapi/task_process.h"
#include "tests/appliance/vornd/support.h"

namespace {

using appliance::TaskHost;
using vornd_test::Eventually;
using vornd_test::IsAlive;
using vornd_test::Object;
using vornd_test::PidsIn;

class PollingTest : public ::testing::Test {
protected:
    PollingTest() {
        std::filesystem::create_directories(tree_.At("/var/lib/vorn"));
        request_.impl->taskHost = &host_;
        module_ = dlopen(tree_.At("/usr/vorn/lib/modules/test_module.so").c_str(), RTLD_NOW | RTLD_LOCAL);
        EXPECT_NE(module_, nullptr) << dlerror();
    }
    ~PollingTest() override {
        dlclose(module_);
    }

    VORN::APITaskFunction Body(const char* symbol) const {
        return reinterpret_cast<VORN::APITaskFunction>(dlsym(module_, symbol));
    }
    // Starts a task and answers its id; empty when it could not be started.
    std::string Start(const char* symbol, const Json::Value& parameters = Json::Value(Json::objectValue)) {
        request_.impl->parameters = parameters;
        VORN::APIPolling polling(&request_);
        polling.SetGroupAttr("admin");
        polling.SetPrefixAttr("Test");
        VORN::APIResponse response;
        EXPECT_TRUE(polling.Start(&response, Body(symbol), nullptr)) << polling.GetError();
        EXPECT_TRUE(response.impl->success);
        return response.impl->data["task_id"].asString();
    }
    Json::Value Status(const std::string& id) {
        VORN::APIPolling polling(&request_);
        Json::Value status;
        EXPECT_TRUE(polling.Status(id, status)) << polling.GetError();
        return status;
    }
    Json::Value EndOf(const std::string& id) {
        EXPECT_TRUE(Eventually([&] { return Status(id)["finish"].asBool(); }));
        return Status(id);
    }
    pid_t PidOf(const std::string& id) {
        EXPECT_TRUE(Eventually([&] { return Status(id)["data"].isMember("pid"); }));
        return Status(id)["data"]["pid"].asInt();
    }
    bool Stop(const std::string& id, bool force = true) {
        return VORN::APIPolling(&request_).Stop(id, force);
    }

    vornd_test::Tree tree_;
    const TaskHost host_{tree_.At("/var/lib/vorn/tasks.db"), {VORN_TEST_VORND, "--root", tree_.root()}};
    VORN::APIRequest request_;
    void* module_ = nullptr;
};

void ExpectFailure(const Json::Value& status, int code) {
    EXPECT_EQ(status["finish"], Json::Value(true));
    EXPECT_EQ(status["success"], Json::Value(false));
    EXPECT_EQ(status["error"]["code"], Json::Value(code));
    EXPECT_TRUE(status["error"].isMember("errors"));
}

TEST_F(PollingTest, RunsToItsEnd) {
    const std::string id = Start("TaskSteps", Object({{"steps", 3}}));
    EXPECT_EQ(EndOf(id), Object({{"finish", true}, {"success", true}, {"data", Object({{"step", 3}})}}));
}

TEST_F(PollingTest, PublishesProgressInOrder) {
    const std::string id = Start("TaskSteps", Object({{"steps", 20}, {"pause", 100}}));
    int last = 0;
    int seen = 0;
    for (Json::Value status = Status(id); !status["finish"].asBool(); status = Status(id)) {
        EXPECT_EQ(status["success"], Json::Value(true));
        const int step = status["data"]["step"].asInt();
        EXPECT_GE(step, last);
        seen += step > last ? 1 : 0;
        last = step;
        usleep(5000);
    }
    EXPECT_GT(seen, 10) << "each step is seen at once";
    EXPECT_EQ(Status(id)["data"]["step"], Json::Value(20));
}

TEST_F(PollingTest, SeesTheRequestWithoutItsSecretsInASessionOfItsOwn) {
    const std::string id =
        Start("TaskShowRequest", Object({{"kept", "a"}, {"password", "Canary"}, {"nested", Object({{"a", 1}})}}));
    const Json::Value data = EndOf(id)["data"];
    EXPECT_EQ(data["has"], Object({{"kept", true}, {"password", false}, {"nested", true}}));
    EXPECT_EQ(data["value"]["kept"], Json::Value("a"));
    EXPECT_EQ(data["value"]["nested"]["a"], Json::Value(1));
    EXPECT_EQ(data["null_user_data"], Json::Value(true));
    EXPECT_EQ(data["leads_group"], Json::Value(true));
    EXPECT_EQ(data["leads_session"], Json::Value(true));
}

TEST_F(PollingTest, LeavesNoChildBehind) {
    const std::string id = Start("TaskWait");
    const pid_t pid = PidOf(id);
    std::ifstream children("/proc/self/task/" + std::to_string(getpid()) + "/children");
    EXPECT_EQ(std::string(std::istreambuf_iterator<char>(children), {}), "");
    EXPECT_TRUE(IsAlive(pid));
    EXPECT_TRUE(Stop(id));
}

TEST_F(PollingTest, TheLastAnswerIsTheResult) {
    ExpectFailure(EndOf(Start("TaskError")), 2623);
    EXPECT_EQ(Status(Start("TaskError"))["success"].type(), Json::booleanValue);
    const Json::Value success = EndOf(Start("TaskErrorThenSuccess"));
    EXPECT_EQ(success, Object({{"finish", true}, {"success", true}, {"data", {}}}));
}

TEST_F(PollingTest, AnErrorKeepsItsReasonAndTheProgress) {
    const Json::Value status = EndOf(Start("TaskError"));
    EXPECT_EQ(status["error"]["errors"], Json::Value("why"));
    EXPECT_EQ(status["data"], Object({{"step", 1}}));
}

TEST_F(PollingTest, FailsWithoutAResult) {
    ExpectFailure(EndOf(Start("TaskThrow")), 123);
    ExpectFailure(EndOf(Start("TaskSilent")), 120);
    ExpectFailure(EndOf(Start("TaskExit")), 120);
}

TEST_F(PollingTest, FailsWhenAnExceptionOfNoStandardTypeLeavesIt) {
    const std::string path = tree_.At("/usr/vorn/lib/modules/throwing_module.so");
    std::filesystem::copy_file(VORN_THROWING_MODULE, path);
    dlclose(std::exchange(module_, dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL)));
    ASSERT_NE(module_, nullptr) << dlerror();
    ExpectFailure(EndOf(Start("TaskThrowNumber")), 123);
}

TEST_F(PollingTest, FailsWhenItsProcessIsKilled) {
    const std::string id = Start("TaskWait");
    const pid_t pid = PidOf(id);
    EXPECT_EQ(Status(id)["finish"], Json::Value(false));
    kill(pid, SIGKILL);
    ExpectFailure(EndOf(id), 120);
}

TEST_F(PollingTest, StopEndsTheTaskAndAllThatItStarted) {
    const std::string file = tree_.At("/tmp/family");
    const std::string id = Start("TaskFamily", Object({{"file", file}}));
    const pid_t pid = PidOf(id);
    ASSERT_EQ(PidsIn(file).size(), 2u);
    EXPECT_TRUE(Stop(id));
    EXPECT_FALSE(IsAlive(pid));
    for (const pid_t child : PidsIn(file)) {
        EXPECT_FALSE(IsAlive(child));
    }
    ExpectFailure(Status(id), 121);
}

TEST_F(PollingTest, StopWithoutForceLeavesWhatTheTaskStarted) {
    const std::string file = tree_.At("/tmp/family");
    const std::string id = Start("TaskFamily", Object({{"file", file}}));
    const pid_t pid = PidOf(id);
    EXPECT_TRUE(Stop(id, false));
    EXPECT_FALSE(IsAlive(pid));
    ExpectFailure(Status(id), 121);
    for (const pid_t child : PidsIn(file)) {
        EXPECT_TRUE(IsAlive(child));
        kill(child, SIGKILL);
    }
}

TEST_F(PollingTest, StopLeavesOtherTasksAlone) {
    const std::string first = Start("TaskWait");
    const std::string second = Start("TaskWait");
    EXPECT_NE(first, second);
    const pid_t pid = PidOf(second);
    EXPECT_TRUE(Stop(first));
    EXPECT_TRUE(IsAlive(pid));
    EXPECT_EQ(Status(second)["finish"], Json::Value(false));
    EXPECT_TRUE(Stop(second));
    EXPECT_FALSE(IsAlive(pid));
}

TEST_F(PollingTest, StopLeavesAnEndedTaskAsItIs) {
    const std::string id = Start("TaskSteps");
    const Json::Value ended = EndOf(id);
    EXPECT_TRUE(Stop(id));
    EXPECT_EQ(Status(id), ended);
    const std::string stopped = Start("TaskWait");
    EXPECT_TRUE(Stop(stopped));
    EXPECT_TRUE(Stop(stopped));
    ExpectFailure(Status(stopped), 121);
}

TEST_F(PollingTest, ListsTheTasksOfGroups) {
    const std::string first = Start("TaskSteps");
    const std::string second = Start("TaskSteps");
    VORN::APIPolling polling(&request_);
    Json::Value groups(Json::arrayValue);
    groups.append("admin");
    groups.append("users");
    Json::Value tasks;
    ASSERT_TRUE(polling.List("Test", groups, tasks));
    ASSERT_EQ(tasks["admin"].size(), 2u);
    EXPECT_EQ(tasks["admin"][0], Json::Value(first));
    EXPECT_EQ(tasks["admin"][1], Json::Value(second));
    EXPECT_EQ(tasks["users"], Json::Value(Json::arrayValue));
    ASSERT_TRUE(polling.List("Other", groups, tasks));
    EXPECT_EQ(tasks["admin"], Json::Value(Json::arrayValue));
}

TEST_F(PollingTest, RefusesWhatIsNoListOfGroups) {
    VORN::APIPolling polling(&request_);
    EXPECT_EQ(polling.GetError(), 0);
    Json::Value tasks("before");
    Json::Value numbers(Json::arrayValue);
    numbers.append(1);
    for (const Json::Value& groups : {Json::Value("admin"), numbers, Json::Value()}) {
        EXPECT_FALSE(polling.List("Test", groups, tasks));
        EXPECT_EQ(polling.GetError(), 127);
        EXPECT_EQ(tasks, Json::Value("before"));
    }
}

TEST_F(PollingTest, KnowsNoOtherTask) {
    VORN::APIPolling polling(&request_);
    Json::Value status("before");
    EXPECT_FALSE(polling.Status("Test_00000000000000000000000000000000", status));
    EXPECT_EQ(polling.GetError(), 122);
    EXPECT_EQ(status, Json::Value("before"));
    EXPECT_FALSE(polling.Stop("../../etc/passwd", true));
    EXPECT_EQ(polling.GetError(), 122);
}

TEST_F(PollingTest, TheRemoveAttributeTakesTheRecordAwayOnceItsEndWasRead) {
    VORN::APIPolling polling;
    polling.SetRequest(&request_);
    polling.SetGroupAttr("admin");
    polling.SetPrefixAttr("Test");
    polling.SetRemoveAttr(true);
    request_.impl->parameters = Object({{"steps", 5}, {"pause", 30}});
    VORN::APIResponse response;
    ASSERT_TRUE(polling.Start(&response, Body("TaskSteps"), nullptr));
    const std::string id = response.impl->data["task_id"].asString();
    Json::Value status;
    EXPECT_TRUE(Eventually([&] { return polling.Status(id, status) && status["finish"].asBool(); }));
    EXPECT_EQ(status["data"]["step"], Json::Value(5));
    EXPECT_FALSE(polling.Status(id, status));
    EXPECT_EQ(polling.GetError(), 122);
}

TEST_F(PollingTest, RefusesWhatCantBeATask) {
    VORN::APIPolling polling(&request_);
    polling.SetGroupAttr("admin");
    polling.SetPrefixAttr("Test");
    const auto refused = [&](VORN::APITaskFunction body, void* userData = nullptr) {
        VORN::APIResponse response;
        const bool started = polling.Start(&response, body, userData);
        EXPECT_EQ(response.impl->code, 127);
        EXPECT_TRUE(response.impl->answered && !response.impl->success);
        return !started && polling.GetError() == 127;
    };
    int data = 0;
    EXPECT_TRUE(refused(nullptr));
    EXPECT_TRUE(refused(Body("TaskSteps"), &data));
    EXPECT_TRUE(refused([](VORN::APIRequest*, VORN::APIResponse*, void*) {}));
    EXPECT_FALSE(polling.Start(nullptr, Body("TaskSteps"), nullptr));
    polling.SetRequest(nullptr);
    EXPECT_TRUE(refused(Body("TaskSteps")));
    polling.SetRequest(&request_);
    polling.SetPrefixAttr("a/b");
    EXPECT_TRUE(refused(Body("TaskSteps")));
}

TEST_F(PollingTest, AStartThatFailsLeavesNoRecord) {
    // The process would load the module, and others may write it now.
    std::filesystem::permissions(tree_.At("/usr/vorn/lib/modules/test_module.so"), std::filesystem::perms(0777));
    VORN::APIPolling polling(&request_);
    polling.SetGroupAttr("admin");
    polling.SetPrefixAttr("Test");
    VORN::APIResponse response;
    EXPECT_FALSE(polling.Start(&response, Body("TaskSteps"), nullptr));
    EXPECT_EQ(response.impl->code, 124);
    EXPECT_EQ(polling.GetError(), 124);
    Json::Value groups(Json::arrayValue);
    groups.append("admin");
    Json::Value tasks;
    ASSERT_TRUE(polling.List("", groups, tasks));
    EXPECT_EQ(tasks["admin"].size(), 0u);
}

TEST_F(PollingTest, OneThatIsStoppedBeforeItBeginsWasStarted) {
    // Its process comes so late that the record is a stopped one's by then.
    const TaskHost host{host_.database,
                        {"/bin/sh", "-c", "while ! [ -e \"$0\" ]; do sleep 0.01; done; exit 1", tree_.At("/stopped")}};
    request_.impl->taskHost = &host;
    std::thread stop([this] {
        Json::Value groups(Json::arrayValue);
        groups.append("admin");
        Json::Value tasks;
        EXPECT_TRUE(Eventually(
            [&] { return VORN::APIPolling(&request_).List("Test", groups, tasks) && tasks["admin"].size() == 1; }));
        EXPECT_TRUE(Stop(tasks["admin"][0].asString()));
        tree_.Write("/stopped", "");
    });
    const std::string id = Start("TaskSteps");
    stop.join();
    ExpectFailure(Status(id), 121);
}

TEST_F(PollingTest, AProgramThatIsNotThereFailsTheStart) {
    const TaskHost host{host_.database, {tree_.At("/nowhere/vornd")}};
    request_.impl->taskHost = &host;
    VORN::APIPolling polling(&request_);
    VORN::APIResponse response;
    EXPECT_FALSE(polling.Start(&response, Body("TaskSteps"), nullptr));
    EXPECT_EQ(polling.GetError(), 124);
}

TEST_F(PollingTest, AStoreThatCantBeUsedFailsEachCall) {
    const TaskHost host{tree_.At("/nowhere/tasks.db"), host_.command};
    request_.impl->taskHost = &host;
    VORN::APIPolling polling(&request_);
    VORN::APIResponse response;
    Json::Value value;
    Json::Value groups(Json::arrayValue);
    groups.append("admin");
    EXPECT_FALSE(polling.List("Test", groups, value));
    EXPECT_EQ(polling.GetError(), 125);
    EXPECT_FALSE(polling.Status("Test_1", value));
    EXPECT_EQ(polling.GetError(), 125);
    EXPECT_FALSE(polling.Stop("Test_1", true));
    EXPECT_EQ(polling.GetError(), 125);
    EXPECT_FALSE(polling.Start(&response, Body("TaskSteps"), nullptr));
    EXPECT_EQ(response.impl->code, 125);
}

}  // namespace
