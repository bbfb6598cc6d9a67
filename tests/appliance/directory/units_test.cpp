#include "appliance/domain/directory/units.h"

#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::NameOfUnit;
using appliance::ParseUnits;
using appliance::Unit;
using Units = std::vector<Unit>;

constexpr char kTwo[] =
    "Got 2 replies\n\ndistinguishedName: OU=Sales,DC=lab,DC=test\n\n"
    "distinguishedName: OU=Domain Controllers,DC=lab,DC=test\n\n";
const Units kTwoUnits = {{"Domain Controllers", "OU=Domain Controllers,DC=lab,DC=test"},
                         {"Sales", "OU=Sales,DC=lab,DC=test"}};

TEST(UnitNameTest, UndoesTheEscapes) {
    const std::pair<const char*, const char*> names[] = {
        {"OU=Sales,DC=lab,DC=test", "Sales"},
        {"OU=R\\, D,OU=Sales,DC=lab,DC=test", "R, D"},
        {"OU=a\\+b\\\"c\\\\d\\;e\\<f\\>g\\=h,DC=lab", "a+b\"c\\d;e<f>g=h"},
        {"OU=\\ blank\\ ,DC=lab", " blank "},
        {"OU=\\#one,DC=lab", "#one"},
        {"OU=Gr\\C3\\B6\\C3\\9Fe,DC=lab",
         "Gr\xC3\xB6\xC3\x9F"
         "e"},
        {"OU=Gr\xC3\xB6\xC3\x9F"
         "e,DC=lab",
         "Gr\xC3\xB6\xC3\x9F"
         "e"},
        {"ou=small,dc=lab", "small"},
        {"OU=-P,DC=lab", "-P"},
    };
    for (const auto& [place, name] : names) {
        EXPECT_EQ(NameOfUnit(place), std::string(name)) << place;
    }
}

TEST(UnitNameTest, RefusesWhatCannotBeShown) {
    for (const char* place : {"", "OU", "OU=,DC=lab", "CN=Users,DC=lab", "OU=a\\", "OU=a\\0Ab,DC=lab",
                              "OU=a\\00,DC=lab", "OU=a\\FF,DC=lab", "OU=a\nb,DC=lab"}) {
        EXPECT_FALSE(NameOfUnit(place)) << place;
    }
}

TEST(UnitListTest, ReadsTheListInOrder) {
    EXPECT_EQ(ParseUnits(kTwo), kTwoUnits);
    EXPECT_EQ(ParseUnits("Got 0 replies\n\n"), Units{});
}

TEST(UnitListTest, LeavesOutNamesWithControlCharacters) {
    EXPECT_EQ(ParseUnits("Got 2 replies\n\ndistinguishedName: OU=a\\0Adistinguished,DC=lab\n\n"
                         "distinguishedName: OU=Sales,DC=lab,DC=test\n\n"),
              (Units{{"Sales", "OU=Sales,DC=lab,DC=test"}}));
}

TEST(UnitListTest, RefusesDamagedLists) {
    for (const char* text : {"", "Got 2 replies\n\ndistinguishedName: OU=Sales,DC=lab,DC=test\n",
                             "distinguishedName: OU=Sales,DC=lab,DC=test\n", "Got x replies\n",
                             "ads_connect: No logon servers are currently available\n"}) {
        EXPECT_FALSE(ParseUnits(text)) << text;
    }
}

class UnitsTest : public DirectoryTest {
protected:
    UnitsTest() {
        MakeMember(true);
        EXPECT_FALSE(appliance::ReadMembership(membership));
    }
    appliance::Membership membership;
};

TEST_F(UnitsTest, KeepsTheLastGoodList) {
    EXPECT_FALSE(appliance::LoadUnits(membership));
    PutAnswer("net", kTwo);
    EXPECT_EQ(appliance::RefreshUnits(membership, std::chrono::seconds(5)), kTwoUnits);
    PutAnswer("net", "", 255);
    EXPECT_FALSE(appliance::RefreshUnits(membership, std::chrono::seconds(5)));
    PutAnswer("net", "Got 3 replies\n");
    EXPECT_FALSE(appliance::RefreshUnits(membership, std::chrono::seconds(5)));
    EXPECT_EQ(appliance::LoadUnits(membership), kTwoUnits);
    membership.domain = "ELSE";
    EXPECT_FALSE(appliance::LoadUnits(membership));
}

TEST_F(UnitsTest, WaitsNoLongerThanItsDeadline) {
    PutProgram("net", "exec sleep 60");
    const auto started = std::chrono::steady_clock::now();
    EXPECT_FALSE(appliance::RefreshUnits(membership, std::chrono::milliseconds(300)));
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(5));
}

TEST_F(UnitsTest, AnNt4StyleDomainHasNone) {
    membership.kind = appliance::DomainKind::Nt4;
    PutAnswer("net", "", 255);
    EXPECT_EQ(appliance::RefreshUnits(membership, std::chrono::seconds(5)), Units{});
    EXPECT_EQ(appliance::LoadUnits(membership), Units{});
}

}  // namespace
}  // namespace appliance_test
