// The advanced domain options of a request, put into the record of the join and into smbinfo.conf.

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::ErrorAfter;
using unit::FromJson;
using unit::kSmbInfoPath;
using unit::Logs;

constexpr const char* kAll = R"({"enable_advance_option": true, "kdc": "10.0.0.1", "netbios_name": "LAB",
                                 "fqdn_name": "lab.test", "register_nics": ["eth0"]})";

// A record without a zero byte, so that every byte that is set shows.
_tag_VORN_WIN2_ Filled() {
    _tag_VORN_WIN2_ record;
    std::memset(&record, 0xFF, sizeof(record));
    return record;
}

template <std::size_t Size>
void Put(char (&field)[Size], const std::string& text) {
    std::memset(field, 0, Size);
    std::memcpy(field, text.data(), text.size());
}

// A filled record with three texts in fields that are zero otherwise.
_tag_VORN_WIN2_ Record(const std::string& kdc, const std::string& netbiosName, const std::string& fqdn) {
    _tag_VORN_WIN2_ record = Filled();
    Put(record.kdc, kdc);
    Put(record.netbiosName, netbiosName);
    Put(record.fqdn, fqdn);
    return record;
}

bool Same(const _tag_VORN_WIN2_& left, const _tag_VORN_WIN2_& right) {
    return std::memcmp(&left, &right, sizeof(left)) == 0;
}

class AdvancedOptionsJoin : public unit::ModuleTest {
protected:
    AdvancedOptionsJoin() {
        state.keyValueFiles[kSmbInfoPath]["global"] = {
            {"server signing", "yes"}, {"advanced_domain_option", "old"}, {"register nic", "eth7"}};
    }

    // Parameters with these options, given as JSON text.
    static Json::Value Request(const std::string& options) {
        Json::Value parameters(Json::objectValue);
        parameters["advance_domain_conf"] = FromJson(options);
        return parameters;
    }

    // Applies the options and returns what became of a filled record.
    _tag_VORN_WIN2_ Apply(const Json::Value& parameters) {
        _tag_VORN_WIN2_ record = Filled();
        unit::Step<DomainServiceHandler> step(parameters);
        result = step.handler.SaveAdvanceDomain(record);
        error = step.handler.error;
        return record;
    }

    const fake::Section& Stored() {
        return state.keyValueFiles[kSmbInfoPath]["global"];
    }

    bool result = false;
    int error = 0;
};

TEST_F(AdvancedOptionsJoin, FillThreeFieldsOfTheRecordAndNoOther) {
    EXPECT_TRUE(Same(Apply(Request(kAll)), Record("10.0.0.1", "LAB", "lab.test")));
    EXPECT_TRUE(result);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"), Pair("advanced_domain_option", "yes"),
                                      Pair("register nic", "eth0")));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsJoin, ReadTheRequestAndThenStoreTheirTwo) {
    Apply(Request(kAll));
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre(R"(VORN::APIRequest::HasParam("advance_domain_conf"))",
                            R"(VORN::APIRequest::GetParam("advance_domain_conf", null))", "VLIBCSzHashAlloc(1024)",
                            R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                            R"(VLIBCSzHashSetValue(hash, "advanced_domain_option", "yes"))",
                            R"(VLIBCSzHashSetValue(hash, "register nic", "eth0"))",
                            R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                            R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                            R"({"server signing": "yes", "advanced_domain_option": "yes", "register nic": "eth0"}, )"
                            R"("    %s=%s\x0a"))",
                            R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                            "VLIBCSzHashFree(hash)"));
}

TEST_F(AdvancedOptionsJoin, ZeroTheFieldOfAMemberThatIsMissing) {
    EXPECT_TRUE(Same(Apply(Request(R"({"enable_advance_option": true})")), Record("", "", "")));
    EXPECT_TRUE(result);
    EXPECT_TRUE(Same(Apply(Request(R"({"enable_advance_option": true, "kdc": "k"})")), Record("k", "", "")));
    EXPECT_TRUE(Same(Apply(Request(R"({"enable_advance_option": true, "netbios_name": "n"})")), Record("", "n", "")));
    EXPECT_TRUE(Same(Apply(Request(R"({"enable_advance_option": true, "fqdn_name": "f"})")), Record("", "", "f")));
}

TEST_F(AdvancedOptionsJoin, ZeroTheFieldOfAnEmptyText) {
    EXPECT_TRUE(
        Same(Apply(Request(R"({"enable_advance_option": true, "kdc": "", "netbios_name": "", "fqdn_name": null})")),
             Record("", "", "")));
}

TEST_F(AdvancedOptionsJoin, CutTextsToTheirFields) {
    for (const std::size_t length : {126U, 127U, 128U, 129U, 200U, 254U, 255U, 256U, 257U, 1000U}) {
        Json::Value parameters = Request(R"({"enable_advance_option": true})");
        Json::Value& options = parameters["advance_domain_conf"];
        options["kdc"] = std::string(length, 'k');
        options["netbios_name"] = std::string(length, 'n');
        options["fqdn_name"] = std::string(length, 'f');
        const _tag_VORN_WIN2_ record = Apply(parameters);
        EXPECT_TRUE(result);
        EXPECT_TRUE(Same(record, Record(std::string(std::min<std::size_t>(length, 127), 'k'),
                                        std::string(std::min<std::size_t>(length, 127), 'n'),
                                        std::string(std::min<std::size_t>(length, 255), 'f'))))
            << length;
    }
}

TEST_F(AdvancedOptionsJoin, FillTheFieldsInTheirOrder) {
    // A member that is no text ends the filling, so the fields behind it show what they held before.
    const std::vector<std::string> members = {"kdc", "netbios_name", "fqdn_name"};
    for (std::size_t broken = 0; broken < members.size(); ++broken) {
        Json::Value parameters = Request(kAll);
        parameters["advance_domain_conf"][members[broken]] = Json::Value(Json::objectValue);
        _tag_VORN_WIN2_ record = Filled();
        unit::Step<DomainServiceHandler> step(parameters);
        EXPECT_THROW(step.handler.SaveAdvanceDomain(record), Json::Exception);
        _tag_VORN_WIN2_ expected = Filled();
        Put(expected.kdc, broken == 0 ? "" : "10.0.0.1");
        if (broken > 0) {
            Put(expected.netbiosName, broken == 1 ? "" : "LAB");
        }
        if (broken > 1) {
            Put(expected.fqdn, "");
        }
        EXPECT_TRUE(Same(record, expected)) << members[broken];
        EXPECT_EQ(appliance.CountOf("VLIBCSzHashAlloc"), 0);
    }
}

TEST_F(AdvancedOptionsJoin, AreFilledInAlsoWhenTheyCannotBeStored) {
    const std::vector<std::pair<const char*, Fault>> failures = {{"VLIBCSzHashAlloc", Fault::Null()},
                                                                 {"VLIBCSzHashSetValue", Fault::Result(-1)},
                                                                 {"VLIBCFileITmpName", Fault::Result(-1)}};
    const fake::Section before = Stored();
    for (const auto& failure : failures) {
        SCOPED_TRACE(failure.first);
        Restart();
        state.keyValueFiles[kSmbInfoPath]["global"] = before;
        appliance.FailNth(failure.first, 1, failure.second);
        EXPECT_TRUE(Same(Apply(Request(kAll)), Record("10.0.0.1", "LAB", "lab.test")));
        EXPECT_FALSE(result);
        EXPECT_EQ(error, 2617);
        EXPECT_EQ(Stored(), before);
    }
}

TEST_F(AdvancedOptionsJoin, LeaveTheRecordAloneAndAreSwitchedOffWhenNotAskedFor) {
    for (const char* parameters :
         {"{}", R"({"advance_domain_conf": null})", R"({"advance_domain_conf": {}})", R"({"advance_domain_conf": []})",
          R"({"advance_domain_conf": "on"})", R"({"enable_advance_option": true, "kdc": "k"})",
          R"({"advance_domain_conf": {"enable_advance_option": false, "kdc": "k", "register_nics": ["eth0"]}})",
          R"({"advance_domain_conf": {"kdc": "k", "netbios_name": "n", "fqdn_name": "f"}})"}) {
        SCOPED_TRACE(parameters);
        state.keyValueFiles[kSmbInfoPath]["global"] = {
            {"server signing", "yes"}, {"advanced_domain_option", "yes"}, {"register nic", "eth7"}};
        EXPECT_TRUE(Same(Apply(FromJson(parameters)), Filled()));
        EXPECT_TRUE(result);
        EXPECT_EQ(error, 2600);
        EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"), Pair("advanced_domain_option", "no")));
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsJoin, AreNotReadWhenTheRequestHasNone) {
    Apply(FromJson("{}"));
    EXPECT_THAT(appliance.CallTexts(fake::kContainers),
                ElementsAre(R"(VORN::APIRequest::HasParam("advance_domain_conf"))",
                            R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                            R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                            R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                            R"({"server signing": "yes", "advanced_domain_option": "no"}, "    %s=%s\x0a"))",
                            R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))"));
}

TEST_F(AdvancedOptionsJoin, Record2617WithoutALineWhenThereIsNoHashToSwitchThemOff) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_TRUE(Same(Apply(FromJson("{}")), Filled()));
    EXPECT_FALSE(result);
    EXPECT_EQ(error, 2617);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsJoin, Record2617WhenTheyCannotBeSwitchedOff) {
    appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(-1));
    Apply(FromJson("{}"));
    EXPECT_FALSE(result);
    EXPECT_EQ(error, 2617);
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d VLIBCSzHashSetValue() failed [0x%04X %s:%d]",
                                 "VLIBCSzHashSetValue() failed " + ErrorAfter("VLIBCSzHashSetValue"))));
}

}  // namespace
