// The contract's declarations as this library defines them: exported, while everything else in it is hidden. Every source
// that defines an operation includes this header first.

#ifndef VORN_APPLIANCE_PLATFORM_CONTRACT_H
#define VORN_APPLIANCE_PLATFORM_CONTRACT_H

#pragma GCC visibility push(default)
#include "platform/core.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"
#include "platform/scheduler.h"
#include "platform/settings.h"
#include "platform/webapi.h"
#include "platform/webutils.h"
#pragma GCC visibility pop

#endif
