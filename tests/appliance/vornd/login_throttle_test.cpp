// How fast passwords can be tried, and links.

#include "appliance/vornd/login_throttle.h"

#include <gtest/gtest.h>

#include "appliance/vornd/one_time_links.h"

namespace appliance {
namespace {

using Outcome = LoginThrottle::Outcome;

class LoginThrottleTest : public ::testing::Test {
protected:
    // 0 when the attempt was made, else the wait.
    std::int64_t Try(const std::string& address, const std::string& user, Outcome outcome = Outcome::Failure) {
        const std::int64_t wait = throttle_.Begin(address, user);
        if (wait == 0) {
            throttle_.Ended(address, user, outcome);
        }
        return wait;
    }
    void Fail(int times, const std::string& address, const std::string& user) {
        for (int time = 0; time < times; ++time) {
            EXPECT_EQ(Try(address, user), 0);
        }
    }

    std::int64_t now_ = 1000;
    LoginThrottle throttle_{[this] { return now_; }};
};

TEST_F(LoginThrottleTest, AfterFiveFailuresThereIsAWait) {
    Fail(5, "10.0.0.1", "anna");
    EXPECT_EQ(Try("10.0.0.1", "anna"), 30);
    EXPECT_EQ(Try("10.0.0.1", "bert"), 30) << "of the address";
    EXPECT_EQ(Try("10.0.0.2", "ANNA"), 30) << "of the user, in any case";
    EXPECT_EQ(Try("10.0.0.2", "bert"), 0);
    now_ += 29;
    EXPECT_EQ(Try("10.0.0.1", "anna"), 1);
}

TEST_F(LoginThrottleTest, TheWaitDoublesUpToItsLongest) {
    Fail(5, "a", "anna");
    for (const std::int64_t wait : {30, 60, 120, 240, 480, 900, 900}) {
        EXPECT_EQ(Try("a", "anna"), wait);
        now_ += wait;
        EXPECT_EQ(Try("a", "anna"), 0);
    }
}

TEST_F(LoginThrottleTest, FailuresAreForgotten) {
    Fail(4, "a", "anna");
    now_ += LoginThrottle::kFailureWindow;
    Fail(5, "a", "anna");
    EXPECT_EQ(Try("a", "anna"), 30);
    now_ += 30 + LoginThrottle::kFailureWindow - 1;
    Fail(1, "a", "anna");
    EXPECT_EQ(Try("a", "anna"), 60) << "not yet forgotten";
    now_ += 60 + LoginThrottle::kFailureWindow;
    Fail(5, "a", "anna");
    EXPECT_EQ(Try("a", "anna"), 30);
}

TEST_F(LoginThrottleTest, TheWindowSlides) {
    for (int time = 0; time < 20; ++time) {
        Fail(1, "a", "anna");
        now_ += LoginThrottle::kFailureWindow / 4;
    }
}

TEST_F(LoginThrottleTest, ASuccessForgivesTheUserAndNotTheAddress) {
    Fail(4, "a", "anna");
    EXPECT_EQ(Try("a", "anna", Outcome::Success), 0);
    Fail(4, "b", "anna");
    EXPECT_EQ(Try("b", "anna", Outcome::Success), 0);
    Fail(1, "a", "other");
    EXPECT_EQ(Try("a", "third"), 30);
}

TEST_F(LoginThrottleTest, WhatWasNotLookedAtDoesNotCount) {
    for (int time = 0; time < 20; ++time) {
        EXPECT_EQ(Try("a", "anna", Outcome::Unknown), 0);
    }
}

TEST_F(LoginThrottleTest, ManyAtOnceAreNoMoreThanOneByOne) {
    int made = 0;
    for (int attempt = 0; attempt < 20; ++attempt) {
        made += throttle_.Begin("a", "anna") == 0 ? 1 : 0;
    }
    EXPECT_EQ(made, 5);
    for (int attempt = 0; attempt < made; ++attempt) {
        throttle_.Ended("a", "anna", Outcome::Failure);
    }
    EXPECT_EQ(Try("a", "anna"), 30);
    now_ += 30;
    EXPECT_EQ(throttle_.Begin("a", "anna"), 0);
    EXPECT_GT(throttle_.Begin("a", "anna"), 0) << "one at a time now";
}

TEST_F(LoginThrottleTest, OtherNamesDoNotPushACountOut) {
    Fail(5, "a", "anna");
    now_ += 1;
    for (std::size_t more = 0; more < 3 * LoginThrottle::kMostEntries; ++more) {
        Fail(1, "address" + std::to_string(more), "user" + std::to_string(more));
    }
    EXPECT_EQ(Try("b", "anna"), 29);
    EXPECT_EQ(Try("a", "bert"), 29);
}

TEST(ThrottledAddressTest, OfOneClientIsOne) {
    EXPECT_EQ(ThrottledAddress("10.0.0.1"), "10.0.0.1");
    EXPECT_EQ(ThrottledAddress("::ffff:10.0.0.1"), "10.0.0.1");
    EXPECT_EQ(ThrottledAddress("2001:db8:1:2:3:4:5:6"), "2001:db8:1:2::/64");
    EXPECT_EQ(ThrottledAddress("2001:db8:1:2::1"), ThrottledAddress("2001:db8:1:2:ffff::"));
    EXPECT_NE(ThrottledAddress("2001:db8:1:2::1"), ThrottledAddress("2001:db8:1:3::1"));
    EXPECT_EQ(ThrottledAddress(""), "");
}

class OneTimeLinksTest : public ::testing::Test {
protected:
    std::int64_t now_ = 1000;
    OneTimeLinks links_{{[this] { return now_; }, [this] { return 50000 + now_; }}};
};

TEST_F(OneTimeLinksTest, LogInOnce) {
    const OneTimeLinks::Link link = links_.Make();
    const OneTimeLinks::Link other = links_.Make();
    EXPECT_EQ(link.expires, 51000 + kLinkLife);
    EXPECT_FALSE(links_.Use(""));
    EXPECT_FALSE(links_.Use(std::string(kTokenLength, 'A')));
    EXPECT_TRUE(links_.Use(link.token));
    EXPECT_FALSE(links_.Use(link.token));
    EXPECT_TRUE(links_.Use(other.token));
}

TEST_F(OneTimeLinksTest, GrowOld) {
    const OneTimeLinks::Link link = links_.Make();
    now_ += kLinkLife - 1;
    const OneTimeLinks::Link other = links_.Make();
    now_ += 1;
    EXPECT_FALSE(links_.Use(link.token));
    EXPECT_TRUE(links_.Use(other.token));
}

TEST_F(OneTimeLinksTest, TheOldestMakesRoom) {
    const OneTimeLinks::Link first = links_.Make();
    const OneTimeLinks::Link second = links_.Make();
    for (std::size_t more = 2; more <= kMostLinks; ++more) {
        links_.Make();
    }
    EXPECT_FALSE(links_.Use(first.token));
    EXPECT_TRUE(links_.Use(second.token));
}

}  // namespace
}  // namespace appliance
