#pragma once

namespace kelvo::test {

/// Where processor time went in a program whose calls of converters and encoders lead through CodecTime.cpp,
/// in seconds.
struct CodecTime {
    double conversion = 0;  ///< of pictures and of sound
    double encoding =
        0;  ///< in calls of encoders, and in the threads that these keep; of those that were closed
};

/// What was spent, once every encoder is closed: some thread may still be at that. Thread-safe.
CodecTime codecTime();

/// The processor time of the calling thread so far, in seconds.
double threadSeconds();

}  // namespace kelvo::test
