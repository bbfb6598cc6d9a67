// What becomes of a join or a leave that was killed.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_RECOVERY_H
#define VORN_APPLIANCE_DOMAIN_JOIN_RECOVERY_H

#include <chrono>
#include <string>
#include <vector>

namespace appliance {

struct Recovery {
    enum class Result {
        Nothing,  // no join or leave was interrupted
        Running,  // one runs at this moment, or a tool that it started has not ended yet; nothing was done
        Done,     // the membership is the old one or the new one again, or the appliance is in its workgroup
        Pending,  // which of two secrets works can't be found out while no controller answers; to be called again
    };
    Result result = Result::Nothing;
    bool completed = false;          // what had been interrupted is in force now; else it was put back
    std::vector<std::string> notes;  // what was done and what stays behind, for an administrator; logged already
};

// Finishes or puts back what an interrupted join or leave left half done, by its journal and by a test of the secrets,
// and names what stays changed in the log. Called at the start of the server; takes no more than about `patience` when
// no controller answers. What can't be decided in that time is left to a process in the background. Never throws.
Recovery RecoverInterruptedJoin(std::chrono::milliseconds patience = std::chrono::milliseconds(5000));

// What to do with a first membership whose join had come so far that it works, but was not in place yet; and with a
// configuration for which no stored secret works any more.
enum class Wanted {
    Either,  // it is put in place, so that no account is left over in the domain; the appliance goes to its workgroup
    OldOrNone,  // somebody was told that the join failed: it is given up; the appliance goes to its workgroup
    Old,        // a failed join puts things back: it is given up; the configuration stays as it was
};

// The same for a caller that holds the join lock.
Recovery RecoverUnderLock(std::chrono::milliseconds patience, Wanted wanted);

// The same once, for a caller that takes care of what is still running or pending.
Recovery RecoverOnce(std::chrono::milliseconds patience, Wanted wanted);

// Has the join tool recover in the background what could not be recovered at once. Comes back at once.
void RecoverInBackground(Wanted wanted);

// What that background process does: tries again and again for some minutes, then leaves it to the next start or join.
void RecoverWhenPossible(Wanted wanted);

}  // namespace appliance

#endif
