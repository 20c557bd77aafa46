#include "Runtime/Utilities/Format.h"
#include "Tests/Support/ConsoleCapture.h"

#include <algorithm>
#include <gtest/gtest.h>

static std::string gTold; // what the hooks were told, in their order: who, type, and the text in brackets

template <char who, typename Answer = bool>
static Answer Tell(LogType type, const char* format, va_list arguments) {
    char buffer[512];
    vsnprintf(buffer, sizeof(buffer), format, arguments); // uses the list of arguments up
    gTold += who + std::to_string(type) + "[" + buffer + "]";
    return static_cast<Answer>(who == 'P' && type != kLogTypeError);
}

// Types: 0 error, 1 assertion, 2 warning, 3 log, 4 exception; of the record, then of the console function.
TEST(LogAssert, ModeChoosesTypeConsoleFunctionStackTraceAndPosition) {
    constexpr StackTraceLogType none = kStackTraceNone, some = kStackTracePreprocessed, native = kStackTraceNative;
    CleanLogEntryHandlerNode nodes[] = {{nodes + 1, nullptr}, {nodes, Tell<'c', void>}};
    Mutex::AutoLock lock(g_LogHandlerListMutex);
    gCleanLogEntryHandlers = nodes, gCurrentLogEntryHandler = Tell<'p'>; // which takes what would be printed
    gPreprocessor = [](const auto&, auto* shortTrace, auto* trace, auto* file, auto* line) {
        *shortTrace = "short", *trace = "new", *file = "m", *line += 1;
    };
    using Row = std::tuple<UInt32, const char*, StackTraceLogType, const char*, const char*, const char*>;
    for (const auto& [mode, types, table, trace, file, printed] :
         {Row(0x0, "30", none, "", "", ""), Row(0x4, "33", none, "", "", ""), Row(0x284, "23", none, "", "", ""),
          Row(0x1000, "20", none, "", "", ""), Row(0x82, "12", some, "", "", "new\n\n"),
          Row(0x1000103, "01", none, "at", "f", "at\n\n"), Row(0x400001, "00", some, "\nat\n", "f", "at\n\n"),
          Row(0x200000, "11", some, "", "", "new\n\n"), Row(0x440001, "00", some, "at", "f", ""),
          Row(0x1040101, "00", none, "at", "f", "at\n\n"), Row(0x40001, "00", native, "at", "f", ""),
          Row(0x800001, "00", some, "", "f", "new\n\n(Filename: m Line: 13)\n\n"), Row(0x20001, "40", none, "", "", ""),
          Row(0x800001, "00", native, "", "f", "Stacktrace is not supported on this platform.\n\n"),
          Row(0xC00001, "00", some, "at", "f", "at\n\n(Filename: f Line: 12)\n\n"),
          Row(0xC00001, "00", some, "", "f", ""), Row(0xC00001, "00", some, "at", "Debug.bindings", "at\n\n")}) {
        std::fill_n(gStackTraceLogType, kLogTypeCount, table);
        const auto stage = (mode & 0x1000000) != 0 ? DebugStringToFilePostprocessedStacktrace : DebugStringToFile;
        gTold.clear(), stage({"text", "", "", trace, file, 12, -1, mode});
        const char* const clean = *types == '1' ? "Assertion failed: text\nshort" : "text";
        EXPECT_EQ(gTold, Format("c%c[%s\n\n]p%c[text\n%s]", types[0], clean, types[1], printed).c_str()) << mode;
    }
    gCleanLogEntryHandlers = nullptr, gCurrentLogEntryHandler = nullptr, gPreprocessor = nullptr;
    std::fill_n(gStackTraceLogType, kLogTypeCount, some);
}

TEST(LogAssert, TextsArePrintedWithOneAddedNewlineAtMostAndShortFormsFillTheRecord) {
    const ConsoleCapture console;
    gTold.clear(), gCurrentLogEntryHandler = Tell<'P'>;
    gUtpLogFunc = [](const auto& it) {
        gTold += Format("%s:%d:%d %u %d ", it.file, it.line, it.column, it.mode, it.identifier).c_str();
    };
    for (const char* const message : {"", "text\n\n", "100% %n, and long enough for the heap"})
        AssertImplementation(7, "file", 12, -1, message);
    ReportError("two", {"a", 13}), Check(false, "three", {"b", 14}), Check(true, "four"), printf_console("%d", 5);
    gCurrentLogEntryHandler = nullptr, gUtpLogFunc = nullptr;
    EXPECT_EQ(Format("%s", std::string(10'240, 'x').c_str()), std::string(10'239, 'x').c_str()); // cut
    EXPECT_EQ(console.Text(), "\ntext\n\n100% %n, and long enough for the heap\nthree\n5");
    EXPECT_EQ(gTold, "P1[\n]file:12:-1 2 7 P1[text\n\n]file:12:-1 2 7 P1[100% %n, and long enough for the heap\n]"
                     "file:12:-1 2 7 P0[two\n]a:13:-1 1 0 P1[three\n]b:14:-1 2 0 P5[5]");
}
