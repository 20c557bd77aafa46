// Conversions to and from the platform's strings. MakeNSString returns an autoreleased string, never nil: the empty one
// for text that is not valid UTF-8. Any thread.
#pragma once

#include "Runtime/Core/Containers/String.h"

class NSString;

// The label is kMemLabelPathString. Empty for nil, and for a string that has no UTF-8 form.
core::string MakeString(NSString* string);

NSString* MakeNSString(const core::string& text); // up to its first NUL
NSString* MakeNSString(const char* text);         // null gives the empty string
NSString* MakeNSString(core::string_ref text);    // need not end in a NUL
