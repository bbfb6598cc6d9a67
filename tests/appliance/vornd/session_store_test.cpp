// Sessions: when they begin and end, and what outlives the server.

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <memory>

#include "appliance/vornd/session_store.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using appliance::kMostSessions;
using appliance::kSessionAbsolute;
using appliance::kSessionIdle;
using appliance::NewSession;
using appliance::SessionClock;
using appliance::SessionStore;
using ::testing::HasSubstr;
using ::testing::Not;

constexpr std::int64_t kStart = 5000;
constexpr std::int64_t kWallStart = 1764230400;
constexpr const char* kFile = "/run/sessions.json";

class SessionStoreTest : public ::testing::Test {
protected:
    SessionStoreTest() {
        Restart();
    }
    void Restart() {
        store_.reset();
        store_ = std::make_unique<SessionStore>(
            tree_.At(kFile), SessionClock{[this] { return now_; }, [this] { return kWallStart + now_ - kStart; }});
    }
    bool Lives(const NewSession& session) {
        return store_->Find(session.token).has_value();
    }
    void Use(const NewSession& session, bool counts = true) {
        const auto view = store_->Find(session.token);
        ASSERT_TRUE(view.has_value());
        store_->Enter(view->id, counts);
        EXPECT_TRUE(store_->Leave(view->id, counts));
    }

    Tree tree_;
    std::int64_t now_ = kStart;
    std::unique_ptr<SessionStore> store_;
};

TEST_F(SessionStoreTest, TellsItsTokensOnce) {
    const NewSession anna = store_->Begin("anna");
    const NewSession bert = store_->Begin("bert");
    EXPECT_EQ(anna.token.size(), appliance::kTokenLength);
    EXPECT_TRUE(appliance::IsToken(anna.csrf));
    EXPECT_NE(anna.token, bert.token);
    EXPECT_NE(anna.csrf, anna.token);
    EXPECT_EQ(anna.expires, kWallStart + kSessionAbsolute);
    const auto view = store_->Find(anna.token);
    ASSERT_TRUE(view.has_value());
    EXPECT_EQ(view->user, "anna");
    EXPECT_EQ(view->csrf, anna.csrf);
    EXPECT_EQ(view->expires, anna.expires);
    EXPECT_EQ(store_->Count(), 2u);
    const std::string file = tree_.Read(kFile);
    EXPECT_THAT(file, HasSubstr("anna"));
    EXPECT_THAT(file, Not(HasSubstr(anna.token)));
    EXPECT_THAT(file, HasSubstr(appliance::ToHex(appliance::HashOf(anna.token))));
    struct stat found {};
    ASSERT_EQ(stat(tree_.At(kFile).c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777U, 0600u);
}

TEST_F(SessionStoreTest, KnowsNoOtherToken) {
    const NewSession session = store_->Begin("anna");
    std::string near = session.token;
    near.front() = near.front() == 'A' ? 'B' : 'A';
    for (const std::string& token : {std::string(), near, session.csrf, session.token + "A", session.token.substr(1),
                                     appliance::ToHex(appliance::HashOf(session.token)), std::string(43, '\0')}) {
        EXPECT_FALSE(store_->Find(token).has_value());
    }
}

TEST_F(SessionStoreTest, EndsWithoutUse) {
    const NewSession used = store_->Begin("anna");
    const NewSession polled = store_->Begin("bert");
    now_ += kSessionIdle - 1;
    Use(used);
    Use(polled, false);
    now_ += 1;
    EXPECT_TRUE(Lives(used));
    EXPECT_FALSE(Lives(polled));
    now_ += kSessionIdle - 1;
    EXPECT_FALSE(Lives(used));
    EXPECT_EQ(store_->Count(), 0u);
}

TEST_F(SessionStoreTest, EndsAtItsLastHourWhateverItsUse) {
    const NewSession session = store_->Begin("anna");
    for (; now_ < kStart + kSessionAbsolute - 600; now_ += 600) {
        Use(session);
    }
    const auto view = store_->Find(session.token);
    ASSERT_TRUE(view.has_value());
    EXPECT_EQ(view->expires, session.expires);
    store_->Enter(view->id, true);
    now_ = kStart + kSessionAbsolute;
    EXPECT_FALSE(Lives(session));
    EXPECT_FALSE(store_->Leave(view->id, true)) << "the answer of the call is withheld";
    EXPECT_FALSE(Lives(session));
}

TEST_F(SessionStoreTest, ACallThatRunsKeepsItFromEnding) {
    const NewSession session = store_->Begin("anna");
    const std::uint64_t id = store_->Find(session.token)->id;
    store_->Enter(id, true);
    now_ += 2 * kSessionIdle;
    EXPECT_TRUE(Lives(session));
    EXPECT_TRUE(store_->Leave(id, true));
    now_ += kSessionIdle - 1;
    EXPECT_TRUE(Lives(session)) << "it counts from the end of the call";
    now_ += 1;
    EXPECT_FALSE(Lives(session));
}

TEST_F(SessionStoreTest, IsOverWhenItIsEnded) {
    const NewSession ended = store_->Begin("anna");
    const NewSession other = store_->Begin("anna");
    const std::uint64_t id = store_->Find(ended.token)->id;
    store_->Enter(id, true);
    store_->End(id);
    EXPECT_FALSE(Lives(ended));
    EXPECT_TRUE(Lives(other));
    EXPECT_FALSE(store_->Leave(id, true));
    Restart();
    EXPECT_FALSE(Lives(ended));
    EXPECT_TRUE(Lives(other));
}

TEST_F(SessionStoreTest, TheLongestUnusedMakesRoom) {
    const NewSession first = store_->Begin("first");
    const NewSession second = store_->Begin("second");
    const NewSession third = store_->Begin("third");
    ++now_;
    Use(first);
    const std::uint64_t busy = store_->Find(second.token)->id;
    store_->Enter(busy, false);
    for (std::size_t more = 3; more <= kMostSessions; ++more) {
        store_->Begin("more");
    }
    EXPECT_EQ(store_->Count(), kMostSessions);
    EXPECT_TRUE(Lives(first));
    EXPECT_TRUE(Lives(second)) << "it has a call that runs";
    EXPECT_FALSE(Lives(third));
}

TEST_F(SessionStoreTest, OutlivesTheServer) {
    const NewSession session = store_->Begin("anna");
    now_ += kSessionIdle - 1;
    Use(session);
    now_ += 10;
    store_->Save();
    Restart();
    const auto view = store_->Find(session.token);
    ASSERT_TRUE(view.has_value());
    EXPECT_EQ(view->user, "anna");
    EXPECT_EQ(view->csrf, session.csrf);
    EXPECT_EQ(view->expires, session.expires);
    now_ += kSessionIdle - 10;
    EXPECT_FALSE(Lives(session)) << "the time without the server counts";
}

TEST_F(SessionStoreTest, AKilledServerForgetsAMinuteOfUseAtMost) {
    const NewSession session = store_->Begin("anna");
    now_ += 100;
    Use(session);
    now_ += 59;
    Use(session);
    Restart();
    now_ = kStart + 100 + kSessionIdle - 1;
    EXPECT_TRUE(Lives(session));
}

TEST_F(SessionStoreTest, EndsWhileThereIsNoServer) {
    const NewSession session = store_->Begin("anna");
    now_ += kSessionIdle;
    Restart();
    EXPECT_EQ(store_->Count(), 0u);
    EXPECT_FALSE(Lives(session));
}

TEST_F(SessionStoreTest, OfAnotherRunOfTheMachineThereAreNone) {
    const NewSession session = store_->Begin("anna");
    std::string text = tree_.Read(kFile);
    text.replace(text.find("\"boot\":\"") + 8, 8, "00000000");
    tree_.Write(kFile, text, 0600);
    Restart();
    EXPECT_FALSE(Lives(session));
    now_ = 10;
    Restart();
    EXPECT_EQ(store_->Count(), 0u);
}

TEST_F(SessionStoreTest, FromTheFutureThereAreNone) {
    const NewSession session = store_->Begin("anna");
    now_ -= 1;
    Restart();
    EXPECT_FALSE(Lives(session));
}

TEST_F(SessionStoreTest, ADamagedFileHoldsNone) {
    const NewSession session = store_->Begin("anna");
    const std::string good = tree_.Read(kFile);
    const std::string user = R"("user":"anna")";
    ASSERT_THAT(good, HasSubstr(user));
    const auto with = [&](const std::string& from, const std::string& to) {
        std::string text = good;
        return text.replace(text.find(from), from.size(), to);
    };
    const std::string list = good.substr(good.find('['), good.rfind(']') - good.find('[') + 1);
    std::string many = list;
    for (std::size_t more = 0; more < kMostSessions; ++more) {
        std::string one = list.substr(1, list.size() - 2);
        const std::string number = std::to_string(100 + more);
        one.replace(one.find("\"hash\":\"") + 8, number.size(), number);
        many.insert(1, one + ",");
    }
    const std::vector<std::string> damaged = {
        "",
        "{",
        "null",
        "[]",
        "{}",
        good.substr(0, good.size() / 2),
        good + good,
        std::string(300000, ' ') + good,
        with("\"form\":1", "\"form\":2"),
        with("\"form\":1", "\"form\":1.5"),
        with(user, R"("user":7)"),
        with(user, R"("user":"")"),
        with(user, R"("user":"-anna")"),
        with(user, R"("user":"an\u0000na")"),
        with(user, R"("user":"an\nna")"),
        with(user, user + "," + user),
        with("\"used\":5000", "\"used\":4999"),
        with("\"used\":5000", "\"used\":5000.0"),
        with("\"used\":5000", "\"used\":18446744073709551615"),
        with("\"begun\":5000", "\"begun\":-1"),
        with(session.csrf, session.csrf + "A"),
        with("\"hash\":\"", "\"hash\":\"Z"),
        with(list, "[[]]"),
        with(list, "[null]"),
        with(list, "{}"),
        with(list, list.substr(0, list.size() - 1) + "," + list.substr(1)),
        with(list, many),
    };
    for (const std::string& text : damaged) {
        tree_.Write(kFile, text, 0600);
        Restart();
        EXPECT_EQ(store_->Count(), 0u) << text.substr(0, 400);
        const NewSession next = store_->Begin("next");
        EXPECT_TRUE(Lives(next));
    }
    tree_.Write(kFile, good, 0600);
    Restart();
    EXPECT_TRUE(Lives(session)) << "what is not damaged is read";
}

TEST_F(SessionStoreTest, AFileThatOthersMayTouchHoldsNone) {
    const NewSession session = store_->Begin("anna");
    const std::string path = tree_.At(kFile);
    for (const mode_t mode : {0640U, 0602U, 0604U}) {
        store_->Save();
        chmod(path.c_str(), mode);
        Restart();
        EXPECT_EQ(store_->Count(), 0u);
        store_->Begin("next");
    }
    ASSERT_EQ(rename(path.c_str(), (path + ".real").c_str()), 0);
    ASSERT_EQ(symlink((path + ".real").c_str(), path.c_str()), 0);
    Restart();
    EXPECT_EQ(store_->Count(), 0u);
    EXPECT_FALSE(Lives(session));
}

TEST_F(SessionStoreTest, WithoutAFileItGoesOnAndNothingComesBack) {
    const NewSession session = store_->Begin("anna");
    // A folder of this name can't be replaced by a file.
    unlink(tree_.At(kFile).c_str());
    ASSERT_EQ(mkdir(tree_.At(kFile).c_str(), 0700), 0);
    const NewSession next = store_->Begin("bert");
    EXPECT_TRUE(Lives(session));
    EXPECT_TRUE(Lives(next));
    Restart();
    EXPECT_EQ(store_->Count(), 0u);
}

TEST_F(SessionStoreTest, WhatHasEndedDoesNotComeBackWhenTheFileCannotBeReplaced) {
    const NewSession session = store_->Begin("anna");
    // The name has no room for that of a temporary file beside it.
    const std::string path = tree_.At("/run/" + std::string(250, 's'));
    ASSERT_EQ(rename(tree_.At(kFile).c_str(), path.c_str()), 0);
    const SessionClock clock{[this] { return now_; }, [] { return kWallStart; }};
    {
        SessionStore store(path, clock);
        const auto view = store.Find(session.token);
        ASSERT_TRUE(view.has_value());
        store.End(view->id);
    }
    EXPECT_EQ(SessionStore(path, clock).Count(), 0u);
}

}  // namespace
}  // namespace vornd_test
