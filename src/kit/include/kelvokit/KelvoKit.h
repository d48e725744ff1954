#pragma once

/// Everything that an application needs to record itself.
#include <kelvokit/Error.h>
#include <kelvokit/Recorder.h>
#include <kelvokit/Samples.h>
