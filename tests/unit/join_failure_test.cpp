// Why a join failed, by what the join tool says.

#include <cctype>
#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::JoinRequest;
using unit::Logs;

constexpr int kUnknown = 2615;

enum class Kind { kWhole, kAnywhere, kFront };

struct Row {
    const char* name;
    Kind kind;
    const char* text;
    int code;
};

const Row kRows[] = {
    {"System", Kind::kWhole, "Error System.", 2617},
    {"Kdc", Kind::kWhole, "Invalid KDC ip.", 2603},
    {"Workgroup", Kind::kWhole, "Invalid workgroup name.", 2604},
    {"NoController", Kind::kWhole, "Neither LDAP server nor PDC can be found.", 2605},
    {"Unreachable", Kind::kWhole, "445/tcp is unreachable for DC. Please check the network and firewall settings.",
     2606},
    {"Wbinfo", Kind::kWhole, "Wbinfo fail. It might be domain name error.", 2601},
    {"Preauthentication", Kind::kAnywhere, "Preauthentication failed while getting initial credential", 2607},
    {"UnknownClient", Kind::kAnywhere, "Client not found in Kerberos database while getting initial credentials", 2607},
    {"Revoked", Kind::kWhole, "Clients credentials have been revoked while getting initial credentials", 2608},
    {"Disabled", Kind::kAnywhere, "The account was disabled", 2609},
    {"Password", Kind::kAnywhere, "The username or password was not correct.", 2610},
    {"Unable", Kind::kFront, "Unable to join domain", 2611},
    {"Access", Kind::kWhole, "ads_join_realm: Insufficient access", 2611},
    {"Expired", Kind::kWhole, "Password has expired while getting initial credentials", 2612},
    {"Connect", Kind::kFront, "Could not connect to server", 2614},
    {"DomainWorkgroup", Kind::kWhole, "Can't get domain workgroup.", 2613},
};

class JoinFailure : public unit::SetTest {
protected:
    // The code of a failed join with this status, and the one line that only an unknown status leaves.
    void ExpectCode(const std::string& message, int code) {
        SCOPED_TRACE(message);
        Restart();
        MakeJoinFail(message, "the-key");
        EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(code));
        if (code != kUnknown) {
            EXPECT_THAT(Messages(), ElementsAre("Failed to save domain/workgroup info."));
            return;
        }
        ASSERT_EQ(appliance.Logs().size(), 2U);
        EXPECT_THAT(appliance.Logs()[0], Logs("domain.cpp", "%s:%d szStatKey:%s, szStatValue:%s",
                                              "szStatKey:the-key, szStatValue:" + message));
    }
};

class JoinFailureRow : public JoinFailure, public ::testing::WithParamInterface<Row> {
protected:
    std::string text = GetParam().text;
    int whole = GetParam().code;
    int anywhere = GetParam().kind == Kind::kAnywhere ? GetParam().code : kUnknown;
    int front = GetParam().kind == Kind::kWhole ? kUnknown : GetParam().code;
};

TEST_P(JoinFailureRow, IsFoundByItsText) {
    ExpectCode(text, whole);
}

TEST_P(JoinFailureRow, MayGoOnUnlessTheWholeIsCompared) {
    ExpectCode(text + "x", front);
    ExpectCode(text + " ", front);
    ExpectCode(text + "\n", front);
    ExpectCode(text + ": and more of it", front);
    ExpectCode(text + text, front);
}

TEST_P(JoinFailureRow, MayBePrecededOnlyWhenFoundAnywhere) {
    ExpectCode(" " + text, anywhere);
    ExpectCode("x" + text, anywhere);
    ExpectCode("kinit: " + text + ".", anywhere);
}

TEST_P(JoinFailureRow, IsUnknownWhenACharacterIsMissing) {
    ExpectCode(text.substr(1), kUnknown);
    ExpectCode(text.substr(0, text.size() - 1), kUnknown);
    for (std::size_t at = 1; at + 1 < text.size(); ++at) {
        ExpectCode(text.substr(0, at) + text.substr(at + 1), kUnknown);
    }
}

TEST_P(JoinFailureRow, IsUnknownInAnotherCase) {
    std::string upper = text;
    std::string other = text;
    for (char& letter : upper) {
        letter = static_cast<char>(std::toupper(static_cast<unsigned char>(letter)));
    }
    for (char& letter : other) {
        const auto byte = static_cast<unsigned char>(letter);
        if (std::isalpha(byte) != 0) {
            letter = static_cast<char>(std::isupper(byte) != 0 ? std::tolower(byte) : std::toupper(byte));
            break;
        }
    }
    ExpectCode(upper, kUnknown);
    ExpectCode(other, kUnknown);
}

INSTANTIATE_TEST_SUITE_P(Status, JoinFailureRow, ::testing::ValuesIn(kRows),
                         [](const ::testing::TestParamInfo<Row>& row) { return std::string(row.param.name); });

TEST_F(JoinFailure, AMessageThatFitsTwoRowsHasTheCodeOfTheEarlier) {
    ExpectCode("Unable to join domain: The account was disabled", 2609);
    ExpectCode("Could not connect to server: The account was disabled", 2609);
    ExpectCode("Unable to join domain: The username or password was not correct.", 2610);
    ExpectCode("Could not connect to server: The username or password was not correct.", 2610);
    ExpectCode("Unable to join domain: Preauthentication failed while getting initial credentials", 2607);
    ExpectCode("Could not connect to server: Client not found in Kerberos database while getting initial credentials",
               2607);
    ExpectCode("The account was disabled. The username or password was not correct.", 2609);
    ExpectCode("The username or password was not correct. The account was disabled", 2609);
    ExpectCode("The account was disabled: Preauthentication failed while getting initial credential", 2607);
    ExpectCode("The account was disabled: Client not found in Kerberos database while getting initial credentials",
               2607);
    ExpectCode("The username or password was not correct. Preauthentication failed while getting initial credential",
               2607);
    ExpectCode("Unable to join domain: Could not connect to server", 2611);
    ExpectCode("Could not connect to server: Unable to join domain", 2614);
}

TEST_F(JoinFailure, TheSingularOfACredentialFitsThePluralToo) {
    ExpectCode("kinit: Preauthentication failed while getting initial credentials", 2607);
}

TEST_F(JoinFailure, TwoRowsOfWholeTextsAreNoRow) {
    ExpectCode("Invalid KDC ip.Invalid workgroup name.", kUnknown);
    ExpectCode("ads_join_realm: Insufficient accessUnable to join domain", kUnknown);
}

TEST_F(JoinFailure, AnEmptyStatusIsUnknown) {
    ExpectCode("", kUnknown);
}

TEST_F(JoinFailure, AnUnknownStatusIsLoggedAsItIs) {
    ExpectCode("%s %n %d 100% of \xFF\xFE", kUnknown);
}

TEST_F(JoinFailure, AStatusThatCannotBeReadIs2615) {
    for (const bool there : {false, true}) {
        SCOPED_TRACE(there);
        Restart();
        state.joinResult = -1;
        if (there) {
            MakeJoinFail("Invalid KDC ip.");
            appliance.FailNth("ErrWINIState1Get", 1, fake::Fault::Result(-1));
        }
        EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2615));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Failed to join domain.", "Failed to join domain."),
                                Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.",
                                     "Failed to save domain/workgroup info.")));
    }
}

TEST_F(JoinFailure, AStatusIsReadAlsoByAPositiveResult) {
    MakeJoinFail("Invalid KDC ip.");
    appliance.FailNth("ErrWINIState1Get", 1, fake::Fault::Result(1));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2603));
}

TEST_F(JoinFailure, TheStatusIsReadIntoItsTwoBuffers) {
    MakeJoinFail(std::string(600, 'm'), std::string(30, 'k'));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2615));
    EXPECT_THAT(CallsOf({"ErrWINIState1Get"}), ElementsAre("ErrWINIState1Get(size 24, size 512)"));
    EXPECT_EQ(Messages().front(), "szStatKey:" + std::string(23, 'k') + ", szStatValue:" + std::string(511, 'm'));
}

TEST_F(JoinFailure, AStatusIsSearchedUpToItsEndInTheBuffer) {
    const std::string text = "The account was disabled";
    Restart();
    MakeJoinFail(std::string(511 - text.size(), '.') + text);
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2609));
    Restart();
    MakeJoinFail(std::string(512 - text.size(), '.') + text);
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2615));
}

TEST_F(JoinFailure, TheStepRecordsOneCodeAndAnswersNothing) {
    state.joinStatus = fake::JoinStatus{"stat", "Invalid KDC ip."};
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    handler.RecordJoinFailure("lab.test", false);
    EXPECT_EQ(handler.error, 2603);
    EXPECT_THAT(appliance.Answers(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(), ElementsAre("ErrWINIState1Get(size 24, size 512)"));
}

TEST_F(JoinFailure, ACodeThatWasRecordedBeforeStays) {
    state.joinStatus = fake::JoinStatus{"stat", "Invalid KDC ip."};
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    handler.SetError(2618);
    handler.RecordJoinFailure("lab.test", false);
    EXPECT_EQ(handler.error, 2618);
}

}  // namespace
