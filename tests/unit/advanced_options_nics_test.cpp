// The list of network interfaces: one text in the file, an array of names for the client.

#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FromJson;

class Interfaces : public unit::ModuleTest {
protected:
    Json::Value ToArray(const char* list) {
        Json::Value nics = FromJson(R"({"left": "over"})");
        EXPECT_TRUE(step.handler.convertNICtoJsonArray(list, nics));
        return nics;
    }

    std::string ToText(const Json::Value& nics) {
        std::string list = "left over";
        EXPECT_TRUE(step.handler.convertNICtoString(nics, list));
        return list;
    }

    // The pieces of a list that is long.
    std::vector<std::string> Pieces(const std::string& list) {
        std::vector<std::string> pieces;
        for (const Json::Value& nic : ToArray(list.c_str())) {
            pieces.push_back(nic.asString());
        }
        return pieces;
    }

    void TearDown() override {
        EXPECT_EQ(step.handler.error, 2600);
        EXPECT_THAT(appliance.CallTexts(), IsEmpty());
        ModuleTest::TearDown();
    }

    unit::Step<DomainServiceHandler> step;
};

TEST_F(Interfaces, AreAllWhenNoneAreStored) {
    EXPECT_EQ(ToArray(nullptr), FromJson(R"(["all"])"));
    EXPECT_EQ(ToArray(""), FromJson(R"(["all"])"));
}

TEST_F(Interfaces, AreSplitAtCommasAndNotTrimmed) {
    const std::vector<std::pair<const char*, const char*>> lists = {
        {"eth0", R"(["eth0"])"},
        {"eth0,eth1", R"(["eth0", "eth1"])"},
        {"eth0,eth1,bond0", R"(["eth0", "eth1", "bond0"])"},
        {"e,f", R"(["e", "f"])"},
        {"eth0,", R"(["eth0", ""])"},
        {",eth0", R"(["", "eth0"])"},
        {"eth0,,eth1", R"(["eth0", "", "eth1"])"},
        {",", R"(["", ""])"},
        {",,", R"(["", "", ""])"},
        {" eth0 , eth1 ", R"([" eth0 ", " eth1 "])"},
        {" ", R"([" "])"},
        {"eth0;eth1", R"(["eth0;eth1"])"},
        {"all", R"(["all"])"},
        {"eth0,all", R"(["eth0", "all"])"},
    };
    for (const auto& list : lists) {
        EXPECT_EQ(ToArray(list.first), FromJson(list.second)) << list.first;
    }
}

TEST_F(Interfaces, MayBeginWithAnyByte) {
    EXPECT_THAT(Pieces("\xC3\xA9th0,\x01"), ElementsAre("\xC3\xA9th0", "\x01"));
}

TEST_F(Interfaces, ReplaceWhatTheArrayHeld) {
    for (const char* before : {"null", R"("text")", R"(["eth7", "eth8"])", "{}"}) {
        Json::Value nics = FromJson(before);
        EXPECT_TRUE(step.handler.convertNICtoJsonArray("eth0", nics));
        EXPECT_EQ(nics, FromJson(R"(["eth0"])")) << before;
        nics = FromJson(before);
        EXPECT_TRUE(step.handler.convertNICtoJsonArray(nullptr, nics));
        EXPECT_EQ(nics, FromJson(R"(["all"])")) << before;
    }
}

TEST_F(Interfaces, AreCutAt127CharactersOfTheList) {
    for (const std::size_t length : {126U, 127U}) {
        EXPECT_THAT(Pieces(std::string(length, 'e')), ElementsAre(std::string(length, 'e')));
    }
    for (const std::size_t length : {128U, 129U, 500U}) {
        EXPECT_THAT(Pieces(std::string(length, 'e')), ElementsAre(std::string(127, 'e')));
    }
}

TEST_F(Interfaces, AreCutAlsoWithinTheListsLastName) {
    EXPECT_THAT(Pieces(std::string(124, 'e') + ",abcdef"), ElementsAre(std::string(124, 'e'), "ab"));
}

TEST_F(Interfaces, EndInAnEmptyNameWhenTheLastCharacterThatIsTakenIsAComma) {
    EXPECT_THAT(Pieces(std::string(126, 'e') + ",eth1"), ElementsAre(std::string(126, 'e'), ""));
    EXPECT_THAT(Pieces(std::string(127, 'e') + ",eth1"), ElementsAre(std::string(127, 'e')));
}

TEST_F(Interfaces, AreJoinedWithCommas) {
    const std::vector<std::pair<const char*, std::string>> arrays = {
        {R"(["eth0"])", "eth0"},
        {R"(["eth0", "eth1"])", "eth0,eth1"},
        {R"(["eth0", "eth1", "bond0"])", "eth0,eth1,bond0"},
        {R"(["", "eth0"])", ",eth0"},
        {R"(["eth0", ""])", "eth0,"},
        {R"(["eth0", "", "eth1"])", "eth0,,eth1"},
        {R"(["", ""])", ","},
        {R"([""])", ""},
        {R"([" eth0 ", " eth1"])", " eth0 , eth1"},
        {R"(["eth0,eth1", "eth2"])", "eth0,eth1,eth2"},
        {"[]", ""},
        {"null", ""},
    };
    for (const auto& array : arrays) {
        EXPECT_EQ(ToText(FromJson(array.first)), array.second) << array.first;
    }
}

TEST_F(Interfaces, AreNoneAsSoonAsOneOfThemIsAll) {
    for (const char* array : {R"(["all"])", R"(["all", "eth0"])", R"(["eth0", "all"])", R"(["eth0", "all", "eth1"])",
                              R"(["eth0", "eth1", "all", "all"])", R"(["", "all"])"}) {
        EXPECT_EQ(ToText(FromJson(array)), "") << array;
    }
}

TEST_F(Interfaces, AreNamedAllOnlyWordForWord) {
    for (const char* name : {"ALL", "All", "al", "alll", " all", "all ", "all,", "eth0,all"}) {
        Json::Value nics(Json::arrayValue);
        nics.append("eth0");
        nics.append(name);
        EXPECT_EQ(ToText(nics), std::string("eth0,") + name);
    }
}

TEST_F(Interfaces, ThatAreNoTextsFollowTheLibrarysConversion) {
    EXPECT_EQ(ToText(FromJson(R"([1, true, null, "eth0"])")), "1,true,,eth0");
}

TEST_F(Interfaces, ThatCannotBeConvertedThrow) {
    std::string list;
    EXPECT_THROW(step.handler.convertNICtoString(FromJson(R"(["eth0", {}])"), list), Json::Exception);
    // What follows "all" is not looked at.
    EXPECT_EQ(ToText(FromJson(R"(["all", {}])")), "");
}

TEST_F(Interfaces, SurviveTheWayIntoTheFileAndBack) {
    for (const char* array : {R"(["eth0"])", R"(["eth0", "eth1"])", R"(["all"])", R"(["", "eth0", ""])"}) {
        EXPECT_EQ(ToArray(ToText(FromJson(array)).c_str()), FromJson(array));
    }
}

}  // namespace
