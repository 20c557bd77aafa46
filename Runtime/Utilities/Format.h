// Message texts built as printf builds them.
#pragma once

#include "Runtime/Core/Containers/String.h"

// The result has the label kMemLabelGeneral and is cut after 10,239 characters.
[[gnu::format(printf, 1, 2)]] core::string Format(const char* format, ...);
