// Work done in a child whose system calls are seen one by one.

#ifndef VORN_TESTS_APPLIANCE_BASE_TRACED_CHILD_H
#define VORN_TESTS_APPLIANCE_BASE_TRACED_CHILD_H

#include <functional>
#include <vector>

namespace appliance_test {

// Does `work` in a child and kills it with SIGKILL when it enters its system call number `calls` (from 0). False when it
// came to its end before that; then it must have answered true.
bool KilledAtCall(int calls, const std::function<bool()>& work);

// Does `work`, which must answer true, in a child. The system calls that it made (SYS_...), in their order. `rehearsal`
// does the like unwatched before, since what the sanitizers look up at the first time takes system calls of their own.
std::vector<long> CallsOf(const std::function<bool()>& work, const std::function<bool()>& rehearsal);

}  // namespace appliance_test

#endif
