#pragma once

namespace kelvo {

/// Lets this process have as many open files as the system allows it. Clients can make the daemon hold some
/// thousand, within their bounds, and a recording must still find one for its movie. Once, at start.
void raiseDescriptorLimit();

}  // namespace kelvo
