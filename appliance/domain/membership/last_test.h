// The last test of the membership, kept for those who look later.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_LAST_TEST_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_LAST_TEST_H

#include <cstdint>
#include <optional>

#include "appliance/domain/membership/membership.h"

namespace appliance {

struct MembershipTest {
    std::int64_t time = 0;  // when it ended, in seconds since 1970
    bool success = false;   // the domain accepts the machine account
    std::int64_t milliseconds = 0;
};

// Keeps the outcome of a test of this membership. Nothing is kept when the appliance has another membership, or none, by
// now. A failure to write is logged.
void RecordTest(const Membership& tested, const MembershipTest& test);

// The last test of this membership; nothing when there was none, or its record can't be read.
std::optional<MembershipTest> ReadLastTest(const Membership& membership);

// What was tested is no longer true: the appliance has left its domain, or joined anew. A failure is logged.
void ForgetLastTest();

}  // namespace appliance

#endif
