// Error codes of the web-API framework, 100 to 199. A module passes them on: as "errors" of its own code, or as the
// code of a task that failed.

#ifndef VORN_APPLIANCE_PLATFORM_WEBAPI_FRAMEWORK_CODES_H
#define VORN_APPLIANCE_PLATFORM_WEBAPI_FRAMEWORK_CODES_H

namespace appliance {

enum class FrameworkCode : int {
    // Answered by modules: the list or the record of background tasks can't be read; "errors" is one of the codes
    // below.
    TasksUnreadable = 117,

    // The code of a task.
    TaskWithoutResult = 120,  // its process is gone without an end, or its body returned without an answer
    TaskStopped = 121,        // it was stopped
    TaskException = 123,      // an exception left its body; the log has the text

    // The code of a call.
    NoSuchTask = 122,       // the id is unknown, malformed, or its record has been removed
    TaskNotStarted = 124,   // the task's process could not be started, or it could not load the body; see the log
    TaskStoreFailed = 125,  // the records can't be read or written: disk full, file damaged
    TaskNotEnded = 126,     // a stopped task's processes did not end in time
    BadTaskArgument = 127,  // no request, no response, user data, a body that no module exports, a list of no names
};

}  // namespace appliance

#endif
