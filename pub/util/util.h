#pragma once

/* All of the process and device utilities at once, for whoever is compiled against the library as a whole. */

#include "pub/util/device.h"       // IWYU pragma: export
#include "pub/util/mount.h"        // IWYU pragma: export
#include "pub/util/process.h"      // IWYU pragma: export
#include "pub/util/signal-table.h" // IWYU pragma: export
#include "pub/util/thread-end.h"   // IWYU pragma: export
