// Requests and responses.

#include "appliance/platform/webapi/exchange.h"

#include <gtest/gtest.h>

namespace {

TEST(RequestTest, TellsWhatWasSentFromWhatWasNot) {
    VORN::APIRequest request;
    request.impl->parameters["null"] = Json::Value();
    request.impl->parameters["number"] = 7;
    EXPECT_TRUE(request.HasParam("null"));
    EXPECT_FALSE(request.HasParam("other"));
    EXPECT_EQ(request.GetParam("number", "fallback"), Json::Value(7));
    EXPECT_EQ(request.GetParam("null", "fallback"), Json::Value());
    EXPECT_EQ(request.GetParam("other", "fallback"), Json::Value("fallback"));
}

TEST(ResponseTest, TheLastAnswerCounts) {
    VORN::APIResponse response;
    EXPECT_FALSE(response.impl->answered);
    response.SetSuccess(Json::Value("first"));
    response.SetError(2607, Json::Value("why"));
    EXPECT_TRUE(response.impl->answered);
    EXPECT_FALSE(response.impl->success);
    EXPECT_EQ(response.impl->code, 2607);
    EXPECT_EQ(response.impl->errors, Json::Value("why"));
    response.SetSuccess(Json::Value("last"));
    EXPECT_TRUE(response.impl->success);
    EXPECT_EQ(response.impl->data, Json::Value("last"));
}

}  // namespace
