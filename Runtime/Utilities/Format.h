// Message texts built as printf builds them.
#pragma once

#include "Runtime/Core/Containers/String.h"

// The result carries kMemLabelGeneral; one longer than 10,239 characters is cut there.
[[gnu::format(printf, 1, 2)]] core::string Format(const char* format, ...);
