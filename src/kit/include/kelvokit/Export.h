#pragma once

/// Marks what programs may use of the library; everything else in it is hidden.
#define KELVOKIT_EXPORT __attribute__((visibility("default")))
/// Hides a part of something that is exported.
#define KELVOKIT_HIDDEN __attribute__((visibility("hidden")))
