// The scheduled task that keeps the appliance's clock with the domain controller's.

#ifndef VORN_APPLIANCE_PLATFORM_DOMAIN_TIME_TASK_H
#define VORN_APPLIANCE_PLATFORM_DOMAIN_TIME_TASK_H

namespace appliance {

// Makes the hourly task (kSyncTimeCommand) when smb.conf says "vorn sync dctime" = "yes", and synchronises once in the
// background; removes it when it says anything else. To be called whenever that key has been written. What is so already
// stays. 0, or -1 with the last error set.
int ApplyTimeSynchronisation();

}  // namespace appliance

#endif
