// Texts to and from the platform's strings. A string made here is autoreleased and never nil: what is not valid UTF-8
// becomes the empty one. Any thread.
#pragma once

#include "Runtime/Core/Containers/String.h"

class NSString;

// kMemLabelPathString; empty for nil and for a string that has no UTF-8 form.
core::string MakeString(NSString* string);

NSString* MakeNSString(const core::string& text); // up to its first NUL
NSString* MakeNSString(const char* text);         // null: the empty one
NSString* MakeNSString(core::string_ref text);    // need not be terminated
