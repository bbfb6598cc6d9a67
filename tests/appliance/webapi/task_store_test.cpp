// The records of background tasks.

#include "appliance/platform/webapi/task_store.h"

#include <gmock/gmock.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <set>

#include "tests/appliance/vornd/support.h"

namespace appliance {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;

class TaskStoreTest : public ::testing::Test {
protected:
    // The identity of a process that is gone.
    static ProcessIdentity Gone() {
        ProcessIdentity process = ProcessIdentity::OfCaller();
        process.start += 1;
        return process;
    }
    std::string Add(const std::string& prefix = "Test", const std::string& group = "admin") {
        NewTask task;
        task.prefix = prefix;
        task.group = group;
        task.parameters = Json::Value(Json::objectValue);
        return store_.Add(task);
    }
    // A task that runs in this process.
    std::string Running() {
        std::string id = Add();
        EXPECT_TRUE(store_.Claim(id, ProcessIdentity::OfCaller()));
        return id;
    }
    static TaskEnd Success(const Json::Value& data) {
        TaskEnd end;
        end.success = true;
        end.data = data;
        return end;
    }

    vornd_test::Tree tree_;
    const std::string path_ = tree_.At("/tmp/tasks.db");
    TaskStore store_{path_};
};

TEST_F(TaskStoreTest, IdsAreThePrefixAndSomethingNobodyGuesses) {
    std::set<std::string> ids;
    for (int index = 0; index < 100; ++index) {
        ids.insert(Add("DomainUpdate"));
    }
    EXPECT_EQ(ids.size(), 100u);
    EXPECT_THAT(*ids.begin(), MatchesRegex("DomainUpdate_[0-9a-f]+"));
    EXPECT_EQ(ids.begin()->size(), std::string("DomainUpdate_").size() + 32);
}

TEST_F(TaskStoreTest, KeepsWhatATaskIsStartedWith) {
    NewTask task;
    task.group = "admin";
    task.prefix = "Test";
    task.removedWhenRead = true;
    task.module = "/lib/module.so";
    task.symbol = "Body";
    task.parameters["name"] = "\xC3\xA9";
    const std::string id = store_.Add(task);
    const std::optional<TaskRecord> record = TaskStore(path_).Find(id);
    ASSERT_TRUE(record);
    EXPECT_EQ(record->id, id);
    EXPECT_EQ(record->task.group, "admin");
    EXPECT_EQ(record->task.prefix, "Test");
    EXPECT_TRUE(record->task.removedWhenRead);
    EXPECT_EQ(record->task.module, "/lib/module.so");
    EXPECT_EQ(record->task.symbol, "Body");
    EXPECT_EQ(record->task.parameters, task.parameters);
    EXPECT_EQ(record->state, TaskState::Starting);
}

TEST_F(TaskStoreTest, NoSecretIsKept) {
    NewTask task;
    task.parameters["password"] = "Canary-7";
    task.parameters["oldPassWd"] = "Canary-7";
    task.parameters["nested"]["list"][0]["client_secret"] = "Canary-7";
    task.parameters["nested"]["list"][0]["kept"] = 1;
    task.parameters["pwd"] = "Canary-7";
    task.parameters["Token"] = "Canary-7";
    const std::string id = store_.Add(task);
    Json::Value expected(Json::objectValue);
    expected["nested"]["list"][0]["kept"] = 1;
    EXPECT_EQ(store_.Find(id)->task.parameters, expected);
    for (const char* file : {"/tmp/tasks.db", "/tmp/tasks.db-wal"}) {
        EXPECT_EQ(tree_.Read(file).find("Canary-7"), std::string::npos) << file;
    }
}

TEST_F(TaskStoreTest, ListsAGroupsTasksByPrefixInTheirOrder) {
    const std::string first = Add("Test");
    const std::string second = Add("Testing");
    const std::string other = Add("Other");
    const std::string strange = Add("Test", "users");
    EXPECT_THAT(store_.List("Test", "admin"), ElementsAre(first, second));
    EXPECT_THAT(store_.List("Testing", "admin"), ElementsAre(second));
    EXPECT_THAT(store_.List("", "admin"), ElementsAre(first, second, other));
    EXPECT_THAT(store_.List("Test", "users"), ElementsAre(strange));
    EXPECT_THAT(store_.List("Test", "nobody"), IsEmpty());
    EXPECT_THAT(store_.List("T_st", "admin"), IsEmpty());
}

TEST_F(TaskStoreTest, FindsNoIdThatCanBeNone) {
    const std::string id = Running();
    for (const std::string& wrong :
         {std::string(), id + "x", id.substr(1), std::string("' OR 1=1 --"), std::string(100000, 'a'), id + "\n",
          std::string("a\0b", 3), std::string("\xFF\xFE")}) {
        EXPECT_FALSE(store_.Find(wrong));
    }
    EXPECT_TRUE(store_.Find(id));
}

TEST_F(TaskStoreTest, ProgressAndEnd) {
    const std::string id = Running();
    EXPECT_EQ(store_.Find(id)->Status(), vornd_test::Object({{"finish", false}, {"success", true}, {"data", {}}}));
    store_.Publish(id, Json::Value("half"));
    EXPECT_EQ(store_.Find(id)->Status(), vornd_test::Object({{"finish", false}, {"success", true}, {"data", "half"}}));
    store_.End(id, Success(Json::Value("done")));
    const Json::Value ended = vornd_test::Object({{"finish", true}, {"success", true}, {"data", "done"}});
    EXPECT_EQ(store_.Find(id)->Status(), ended);
    // What comes after the end has no effect.
    store_.Publish(id, Json::Value("late"));
    store_.End(id, TaskEnd());
    store_.MarkStopping(id);
    store_.MarkStopped(id);
    EXPECT_EQ(store_.Find(id)->Status(), ended);
}

TEST_F(TaskStoreTest, SuccessWithNullReplacesTheProgress) {
    const std::string id = Running();
    store_.Publish(id, Json::Value("half"));
    store_.End(id, Success(Json::Value()));
    EXPECT_TRUE(store_.Find(id)->data.isNull());
}

TEST_F(TaskStoreTest, FailureKeepsTheProgressAndHasACode) {
    const std::string id = Running();
    store_.Publish(id, Json::Value("half"));
    TaskEnd end;
    end.code = 2623;
    end.errors = Json::Value("why");
    store_.End(id, end);
    Json::Value expected = vornd_test::Object({{"finish", true}, {"success", false}, {"data", "half"}});
    expected["error"]["code"] = 2623;
    expected["error"]["errors"] = "why";
    EXPECT_EQ(store_.Find(id)->Status(), expected);
}

TEST_F(TaskStoreTest, ATaskIsClaimedOnce) {
    const std::string id = Add();
    EXPECT_TRUE(store_.Claim(id, ProcessIdentity::OfCaller()));
    EXPECT_FALSE(store_.Claim(id, ProcessIdentity::OfCaller()));
    EXPECT_FALSE(store_.Claim("Test_unknown", ProcessIdentity::OfCaller()));
}

TEST_F(TaskStoreTest, StoppingBeforeItsProcessHasClaimedIt) {
    const std::string id = Add();
    store_.MarkStopping(id);
    EXPECT_EQ(store_.Find(id)->Status()["error"]["code"], Json::Value(121));
    EXPECT_FALSE(store_.Claim(id, ProcessIdentity::OfCaller()));
}

TEST_F(TaskStoreTest, StoppingOneThatRuns) {
    const std::string id = Running();
    store_.MarkStopping(id);
    EXPECT_EQ(store_.Find(id)->state, TaskState::Stopping);
    EXPECT_EQ(store_.Find(id)->Status()["finish"], Json::Value(false));
    store_.Publish(id, Json::Value("late"));
    store_.End(id, Success(Json::Value("late")));
    store_.MarkStopped(id);
    EXPECT_EQ(store_.Find(id)->Status()["error"]["code"], Json::Value(121));
    EXPECT_TRUE(store_.Find(id)->data.isNull());
}

TEST_F(TaskStoreTest, WhoseProcessIsGoneHasFailed) {
    for (const bool byList : {true, false}) {
        const std::string id = Add();
        ASSERT_TRUE(store_.Claim(id, Gone()));
        if (byList) {
            store_.List("Test", "admin");
        }
        Json::Value expected = vornd_test::Object({{"finish", true}, {"success", false}, {"data", {}}});
        expected["error"]["code"] = 120;
        expected["error"]["errors"] = Json::Value();
        EXPECT_EQ(store_.Find(id)->Status(), expected);
    }
}

TEST_F(TaskStoreTest, WhoseProcessIsOfAnotherRunOfTheMachineHasFailed) {
    const std::string id = Add();
    ProcessIdentity process = ProcessIdentity::OfCaller();
    process.boot = "another";
    ASSERT_TRUE(store_.Claim(id, process));
    EXPECT_EQ(store_.Find(id)->code, 120);
}

TEST_F(TaskStoreTest, WhoseProcessIsAZombieHasFailed) {
    const pid_t child = fork();
    if (child == 0) {
        pause();
        _exit(0);
    }
    const std::string id = Add();
    ASSERT_TRUE(store_.Claim(id, ProcessIdentity::Of(child)));
    EXPECT_EQ(store_.Find(id)->state, TaskState::Running);
    kill(child, SIGKILL);
    EXPECT_TRUE(vornd_test::Eventually([&] { return store_.Find(id)->state == TaskState::Ended; }));
    EXPECT_EQ(store_.Find(id)->code, 120);
    waitpid(child, nullptr, 0);
}

TEST_F(TaskStoreTest, WhoseProcessDiedWhileItWasStoppedIsStopped) {
    const std::string id = Add();
    ASSERT_TRUE(store_.Claim(id, ProcessIdentity::OfCaller()));
    store_.MarkStopping(id);
    Database(path_, Database::Mode::ReadWrite).Execute("UPDATE tasks SET start=start+1");
    EXPECT_EQ(store_.Find(id)->code, 121);
}

TEST_F(TaskStoreTest, EndedRecordsAreBoundedForEachPrefix) {
    const std::string running = Running();
    const std::string other = Add("Other");
    store_.MarkStopping(other);
    std::string last;
    for (int index = 0; index < kEndedTasksKept + 20; ++index) {
        last = Running();
        store_.End(last, Success(Json::Value(index)));
    }
    const std::string next = Running();
    const std::vector<std::string> ids = store_.List("Test", "admin");
    EXPECT_EQ(ids.size(), static_cast<std::size_t>(kEndedTasksKept) + 2);
    EXPECT_EQ(ids.front(), running);
    EXPECT_EQ(ids.back(), next);
    EXPECT_EQ(ids[ids.size() - 2], last);
    EXPECT_TRUE(store_.Find(other));
}

TEST_F(TaskStoreTest, EndedRecordsGoWithTheirAge) {
    const std::string old = Running();
    store_.End(old, Success(Json::Value()));
    const std::string running = Running();
    Database(path_, Database::Mode::ReadWrite)
        .Execute("UPDATE tasks SET ended=ended-" + std::to_string(kEndedTasksAge + 10) + " WHERE ended>0");
    const auto kept = [&] {
        Database database(path_, Database::Mode::ReadWrite);
        Statement count(database, "SELECT count(*) FROM tasks");
        count.Step();
        return count.Number(0);
    };
    // Nobody finds it, also while no new task comes.
    EXPECT_FALSE(store_.Find(old));
    EXPECT_TRUE(store_.Find(running));
    EXPECT_THAT(store_.List("Test", "admin"), ElementsAre(running));
    EXPECT_EQ(kept(), 2);
    Add();
    EXPECT_EQ(kept(), 2);
}

TEST_F(TaskStoreTest, EndedRecordsAreFoundUntilThen) {
    const std::string id = Running();
    store_.End(id, Success(Json::Value()));
    Database(path_, Database::Mode::ReadWrite)
        .Execute("UPDATE tasks SET ended=ended-" + std::to_string(kEndedTasksAge - 60));
    EXPECT_TRUE(store_.Find(id));
    EXPECT_THAT(store_.List("Test", "admin"), ElementsAre(id));
}

TEST_F(TaskStoreTest, ReadersNeverSeeHalfAnEnd) {
    const pid_t child = fork();
    if (child == 0) {
        TaskStore writer(path_);
        for (int index = 0; index < 200; ++index) {
            NewTask task;
            task.group = "admin";
            task.prefix = "Race";
            const std::string id = writer.Add(task);
            writer.Claim(id, ProcessIdentity::OfCaller());
            writer.Publish(id, Json::Value("half"));
            writer.End(id, Success(Json::Value("done")));
        }
        _exit(0);
    }
    int status = 0;
    while (waitpid(child, &status, WNOHANG) == 0) {
        for (const std::string& id : store_.List("Race", "admin")) {
            const std::optional<TaskRecord> record = store_.Find(id);
            if (record && record->state == TaskState::Ended) {
                EXPECT_TRUE(record->success);
                EXPECT_EQ(record->data, Json::Value("done"));
            }
        }
    }
    EXPECT_EQ(status, 0);
}

TEST(TaskNameTest, TakesLettersDigitsAndThreeMarks) {
    EXPECT_TRUE(IsTaskName(""));
    EXPECT_TRUE(IsTaskName("aZ09_-."));
    EXPECT_TRUE(IsTaskName(std::string(128, 'a')));
    EXPECT_FALSE(IsTaskName(std::string(129, 'a')));
    for (const char* text : {" ", "/", "a b", "\n", "\xC3\xA9", "%", "'"}) {
        EXPECT_FALSE(IsTaskName(text)) << text;
    }
}

}  // namespace
}  // namespace appliance
