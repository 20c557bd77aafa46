#include "MacTest.h"

#include "PlatformDependent/OSX/StringConversions.h"

namespace {

using StringConversionsTest = MacTest;

TEST_F(StringConversionsTest, TextsComeBackAsTheyWere) {
    const std::string longText(1000, 'x');
    for (const char* text : {"", "a",
                             "Stra\xC3\x9F"
                             "e",
                             longText.c_str()}) {
        EXPECT_STREQ(MakeString(MakeNSString(text)).c_str(), text);
        EXPECT_STREQ(MakeString(MakeNSString(core::string(text))).c_str(), text);
        EXPECT_STREQ(MakeString(MakeNSString(core::string_ref(text))).c_str(), text);
        EXPECT_EQ(MakeString(MakeNSString(text)).get_memory_label(), kMemLabelPathString) << text;
    }
    EXPECT_STREQ(MakeString(MakeNSString(core::string_ref("abcdef", 3))).c_str(), "abc") << "a view is not terminated";
    EXPECT_STREQ(MakeString(MakeNSString(core::string("abc", kMemLabelGeneral))).c_str(), "abc");
}

TEST_F(StringConversionsTest, WhatIsNoTextBecomesTheEmptyString) {
    for (NSString* string :
         {MakeNSString(static_cast<const char*>(nullptr)), MakeNSString("\xFF"), MakeNSString(core::string("\xFF")),
          MakeNSString(core::string_ref("\xFF")), MakeNSString(core::string_ref())}) {
        ASSERT_NE(string, nullptr);
        EXPECT_STREQ(NSString_UTF8String(string), "");
    }
    EXPECT_STREQ(MakeString(nullptr).c_str(), "");
    NSString* string = MakeNSString("text");
    gStandinFaults.noUTF8Form = true;
    EXPECT_STREQ(MakeString(string).c_str(), "");
    EXPECT_EQ(MakeString(string).get_memory_label(), kMemLabelPathString);
}

} // namespace
