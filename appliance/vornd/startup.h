// What a start finds, makes and repairs.

#ifndef VORN_APPLIANCE_VORND_STARTUP_H
#define VORN_APPLIANCE_VORND_STARTUP_H

#include <stdexcept>
#include <string>

namespace appliance {

// Why the server can't start: one line that says what and where.
class StartError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// Makes the folders of the appliance's state, each with its mode. Throws StartError.
void MakeFolders();

// Makes the configuration of a first start from the installed defaults, checks that what the appliance is made of is
// there, and removes what a killed predecessor left half written. Throws StartError.
void PrepareConfiguration();

// Opens the records of background tasks and ends those whose process is gone. A damaged file is put aside and a new one
// made; a disk that is full or can't be written is only logged. Throws StartError.
void PrepareTasks();

// Repairs what a killed process may have left in the middle. Failures are logged; the server starts all the same.
void RepairLeftovers();

}  // namespace appliance

#endif
