#pragma once

namespace kelvo {

/// Lets this process have as many open descriptors as it may, up to 65536: each client, each frame that is
/// lent to one and each movie takes some, and the usual limit of 1024 is soon reached. What cannot be raised
/// is logged and stays. Caller's thread.
void raiseDescriptorLimit();

}  // namespace kelvo
