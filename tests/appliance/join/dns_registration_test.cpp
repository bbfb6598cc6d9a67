// Which addresses a join registers. What the directory says is tested with real controllers.

#include "appliance/domain/join/dns_registration.h"

#include <filesystem>

#include "appliance/base/paths.h"
#include "tests/appliance/join/join_test.h"

namespace {

using testing::HasSubstr;
using testing::IsEmpty;

class AddressesTest : public join_test::JoinTest {
protected:
    std::string error_;
    std::vector<std::string> Addresses() {
        std::vector<std::string> addresses;
        error_ = appliance::AddressesToRegister(addresses);
        return addresses;
    }
};

TEST_F(AddressesTest, AreThoseOfTheNamedInterfacesAlone) {
    Put(appliance::kSmbInfo, "[global]\n    register nic = none0 , none1\n");
    EXPECT_THAT(Addresses(), IsEmpty());
    EXPECT_EQ(error_, "no interface has an address to register");
    // Never the loopback's, though it is named.
    Put(appliance::kSmbInfo, "[global]\n    register nic = lo\n");
    EXPECT_THAT(Addresses(), IsEmpty());
    EXPECT_EQ(error_, "no interface has an address to register");
}

// Nobody knows then which are meant: all of them would be too many.
TEST_F(AddressesTest, AreNoneWhenTheOptionsCannotBeRead) {
    std::filesystem::remove(At(appliance::kSmbInfo));
    std::filesystem::create_directories(At(appliance::kSmbInfo));
    EXPECT_THAT(Addresses(), IsEmpty());
    EXPECT_THAT(error_, HasSubstr("smbinfo.conf: "));
}

}  // namespace
