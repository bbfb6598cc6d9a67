// What the tests share that store the advanced domain options: smbinfo.conf with old ones in it.

#ifndef VORN_TESTS_UNIT_SMBINFO_TEST_H
#define VORN_TESTS_UNIT_SMBINFO_TEST_H

#include <string>

#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace unit {

constexpr const char* kOptionsOn = R"({"enable_advance_option": true, "register_nics": ["eth0", "eth1"]})";

class SmbInfoTest : public ModuleTest {
protected:
    SmbInfoTest() {
        Store({{"server signing", "yes"}, {"advanced_domain_option", "old"}, {"register nic", "eth7"}});
    }

    void Store(const fake::Section& section) {
        state.keyValueFiles[kSmbInfoPath] = {{"global", section}};
    }

    const fake::Section& Stored() {
        return state.keyValueFiles[kSmbInfoPath]["global"];
    }

    bool Save(const std::string& options) {
        return step.handler.SaveSMBOption(FromJson(options));
    }

    void StartAnew() {
        const fake::KeyValueFile before = state.keyValueFiles[kSmbInfoPath];
        Restart();
        state.keyValueFiles[kSmbInfoPath] = before;
        step.handler.error = 2600;
    }

    void ExpectUntouched() {
        EXPECT_THAT(Stored(), ::testing::ElementsAre(::testing::Pair("server signing", "yes"),
                                                     ::testing::Pair("advanced_domain_option", "old"),
                                                     ::testing::Pair("register nic", "eth7")));
        EXPECT_FALSE(state.Exists(kSmbInfoTemporary));
        EXPECT_EQ(appliance.CountOf("VLIBCFileAddSection"), 0);
        EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 0);
    }

    Step<DomainServiceHandler> step;
};

}  // namespace unit

#endif
