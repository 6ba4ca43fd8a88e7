// The daemon's way to the platform's libraries: one lock, strings and ints instead of records and
// buffers, and a log line for each failure. The operations are grouped by what they are about.
#pragma once

#include "platform/sdk-device.h"
#include "platform/sdk-file-system.h"
#include "platform/sdk-mutex.h"
#include "platform/sdk-share.h"
#include "platform/sdk-system.h"
#include "platform/sdk-user.h"
