#pragma once

namespace kelvo {

/// Tells the service manager that started this process that it is ready. Nothing happens when there is none.
void reportReadiness();

}  // namespace kelvo
