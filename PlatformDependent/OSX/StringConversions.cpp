#include "PlatformDependent/OSX/StringConversions.h"

#include "PlatformDependent/OSX/Platform.h"

namespace {

NSString* OrEmpty(NSString* string) { return string != nullptr ? string : NSString_string(); }

} // namespace

core::string MakeString(NSString* string) {
    const char* text = NSString_UTF8String(string);
    return core::string(text != nullptr ? text : "", kMemLabelPathString);
}

NSString* MakeNSString(const core::string& text) { return MakeNSString(text.c_str()); }

NSString* MakeNSString(const char* text) {
    return OrEmpty(text != nullptr ? NSString_stringWithUTF8String(text) : nullptr);
}

NSString* MakeNSString(core::string_ref text) {
    return OrEmpty(text.empty() ? nullptr : NSString_initWithBytes(text.data(), text.length(), NSUTF8StringEncoding));
}
