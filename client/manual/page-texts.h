// What the pages say besides the commands.
#pragma once

#include "manual/man-page.h"

[[nodiscard]] ManPage CtlPage();
[[nodiscard]] ManPage NotifierPage();
[[nodiscard]] ManPage DaemonPage();
