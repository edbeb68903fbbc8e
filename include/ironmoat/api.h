#pragma once

/// What the shared client library shows. All else in it is hidden, so that it cannot meet a symbol
/// of the daemon's; so is a daemon's use of it when the daemon hides its own.
#define IRONMOAT_API [[gnu::visibility("default")]]
