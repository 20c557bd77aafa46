#include "Runtime/Utilities/LogAssert.h"

#include "Runtime/Utilities/Format.h"
#include "Tests/Support/ConsoleCapture.h"

#include <algorithm>
#include <csignal>
#include <gtest/gtest.h>

static std::string gTold; // what the hooks were told, in their order

// who, type, and the text in brackets.
template <char who>
static void Tell(LogType type, const char* format, va_list arguments) {
    char buffer[512];
    vsnprintf(buffer, sizeof(buffer), format, arguments);
    gTold += who + std::to_string(type) + "[" + buffer + "]";
}

template <bool prints>
static bool TellAndPrint(LogType type, const char* format, va_list arguments) {
    return Tell<'p'>(type, format, arguments), prints;
}

static CleanLogEntryHandlerNode gNodes[] = {{gNodes + 1, nullptr}, {gNodes + 2, Tell<'a'>}, {gNodes, Tell<'b'>}};

// With a handler that takes what would be printed. The hooks are as they were once a test is over.
struct LogTest : testing::Test {
    LogTest() { gCurrentLogEntryHandler = TellAndPrint<false>; }
    ~LogTest() override {
        gCurrentLogEntryHandler = nullptr;
        gPreprocessor = nullptr;
        gLogToConsoleFunc = gUtpLogFunc = nullptr;
        SetTable(kStackTracePreprocessed);
        gStackTraceLogType[kLogTypeLog] = kStackTraceNone;
        SetCleanHandlers(nullptr);
    }

    static void SetTable(StackTraceLogType value) { std::fill_n(gStackTraceLogType, kLogTypeCount, value); }
    static void SetCleanHandlers(CleanLogEntryHandlerNode* anchor) {
        Mutex::AutoLock lock(g_LogHandlerListMutex);
        gCleanLogEntryHandlers = anchor;
    }
    static std::string ToldOf(const DebugStringToFileData& data, LogForwardFunction stage = DebugStringToFile) {
        return gTold.clear(), stage(data), gTold;
    }
};

TEST_F(LogTest, TextsArePrintedWithOneAddedNewlineAtMostUnlessTheHandlerRefuses) {
    ConsoleCapture console;
    gTold.clear();
    printf_console("%d %s", 2, "not wanted");
    EXPECT_EQ(gTold, "p5[2 not wanted]");
    gCurrentLogEntryHandler = TellAndPrint<true>; // uses its list of arguments up
    for (const char* const message : {"", "\n", "text", "text\n", "text\n\n", "100% %n"})
        DebugStringToFile({.message = message, .mode = 1});
    printf_console("%d of %s", AssertImplementation(0, "", 0, -1, "long enough for the heap, not for a line"), "four");
    EXPECT_EQ(console.Text(), "\n\ntext\ntext\ntext\n\n100% %n\nlong enough for the heap, not for a line\n1 of four");
}

TEST_F(LogTest, ShortFormsFillTheRecord) {
    gUtpLogFunc = [](const DebugStringToFileData& it) {
        gTold = Format("%s:%d:%d %u %d%s", it.file, it.line, it.column, it.mode, it.identifier, it.message).c_str();
    };
    AssertImplementation(7, "folder/file", 12, -1, "one");
    EXPECT_EQ(gTold, "folder/file:12:-1 2 7one");
    ReportError("two");
    EXPECT_EQ(gTold, Format("%s:%d:-1 1 0two", __FILE__, __LINE__ - 1).c_str());
    EXPECT_TRUE(!Check(false, "three") && Check(true, "four"));
    EXPECT_EQ(gTold, Format("%s:%d:-1 2 0three", __FILE__, __LINE__ - 1).c_str());
}

// Types: 0 error, 1 assertion, 2 warning, 3 log, 4 exception.
TEST_F(LogTest, ModeChoosesTypeAndConsoleFunctionByTablesOfTheirOwn) {
    SetCleanHandlers(gNodes);
    gLogToConsoleFunc = [](const DebugStringToFileData&) { gTold += " log"; };
    gUtpLogFunc = [](const DebugStringToFileData&) { gTold += " utp"; };
    using Row = std::tuple<UInt32, char, char>;
    for (const auto& [mode, type, console] :
         {Row(0x0, '3', '0'), Row(0x1, '0', '0'), Row(0x2, '1', '1'), Row(0x4, '3', '3'), Row(0x40, '0', '0'),
          Row(0x80, '2', '2'), Row(0x100, '0', '0'), Row(0x200, '2', '2'), Row(0x400, '3', '3'), Row(0x800, '0', '0'),
          Row(0x1000, '2', '0'), Row(0x20000, '4', '0'), Row(0x200000, '1', '1'), Row(0x20001, '4', '0'),
          Row(0x3, '0', '1'), Row(0x82, '1', '2'), Row(0x284, '2', '3'), Row(0x406, '1', '3')}) {
        const std::string trace = type == '3' ? "" : "frame\n\n", plain = std::string{type} + "[text\n\n]";
        const std::string clean = type == '1' ? "1[Assertion failed: text\nshort\n\n]" : plain;
        EXPECT_EQ(ToldOf({"text", "", "short", "frame", "", 0, -1, mode | 0x400000}),
                  "a" + clean + "b" + clean + "p" + console + "[text\n" + trace + "] log utp")
            << mode;
    }
}

TEST_F(LogTest, StackTraceAndPositionGoToTheConsoleWhenTableAndModeSaySo) {
    constexpr StackTraceLogType none = kStackTraceNone, some = kStackTracePreprocessed, native = kStackTraceNative;
    const char *const bare = "p0[text\n]", *const kept = "p0[text\nframe\n\n]";
    const char* const unsupported = "p0[text\nStacktrace is not supported on this platform.\n\n]";
    const char* const position = "p0[text\nframe\n\n(Filename: f Line: 12)\n\n]";
    using Row = std::tuple<UInt32, StackTraceLogType, const char*, const char*>;
    for (const auto& [mode, table, trace, printed] :
         {Row(0x1, some, "frame", bare), Row(0x400001, some, "frame", kept), Row(0x400001, some, "\nframe\n", kept),
          Row(0x400001, some, "\n\nframe", "p0[text\n\nframe\n\n]"), Row(0x400001, some, "\n", "p0[text\n\n\n]"),
          Row(0x400101, none, "frame", bare), Row(0x440001, some, "frame", bare),
          Row(0x1, native, "frame", unsupported), Row(0x800001, native, "", unsupported),
          Row(0x40001, native, "frame", bare), Row(0x400001, native, "frame", kept),
          Row(0xC00001, some, "frame", position), Row(0xC00001, some, "", bare)}) {
        SetTable(table);
        EXPECT_EQ(ToldOf({"text", "", "", trace, "f", 12, -1, mode}), printed) << mode;
    }
    for (const auto& [file, line] : {std::pair("f", 0), {"", 12}, {"a/Debug.bindings.cs", 12}})
        EXPECT_EQ(ToldOf({"text", "", "", "frame", file, line, -1, 0xC00001}), kept);
    const auto last = DebugStringToFilePostprocessedStacktrace;
    EXPECT_EQ(ToldOf({"text", "", "", "frame", "f", 12, -1, 0x40001}, last), bare);
    SetTable(none);
    for (const auto& [mode, printed] : {std::pair(0x1u, bare), {0x101u, kept}, {0x40001u, bare}, {0x40101u, kept}})
        EXPECT_EQ(ToldOf({"text", "", "", "frame", "f", 12, -1, mode}, last), printed) << mode;
}

TEST_F(LogTest, PreprocessorMakesTracesAndMayMoveThePosition) {
    gPreprocessor = [](const auto& data, auto* shortTrace, auto* trace, auto* file, auto* line) {
        *shortTrace = "short", *trace = "\nlong";
        if (data.line == 5) *file = "elsewhere", *line = 77;
    };
    SetCleanHandlers(gNodes);
    const std::string clean = "1[Assertion failed: text\nshort\n\n]";
    const std::string told = "a" + clean + "b" + clean + "p1[text\nlong\n\n(Filename: ";
    EXPECT_EQ(ToldOf({"text", "", "", "", "f", 5, -1, 0x800002}), told + "elsewhere Line: 77)\n\n]");
    EXPECT_EQ(ToldOf({"text", "", "", "", "f", 6, -1, 0x800002}), told + "f Line: 6)\n\n]");
    EXPECT_EQ(ToldOf({.message = "text", .mode = 0x4}), "a3[text\n\n]b3[text\n\n]p3[text\n]"); // logs ask for none
}

TEST_F(LogTest, FatalRecordStopsTheProcessOnceItIsOut) {
    gCurrentLogEntryHandler = nullptr;
    EXPECT_EXIT((gConsoleFile = stderr, DebugStringToFile({.message = "last words", .mode = 0x11})),
                testing::KilledBySignal(SIGABRT), "last words");
}

TEST(Format, CutsAt10239CharactersUnderTheGeneralLabel) {
    for (const size_t length : {0u, 31u, 32u, 10'239u, 10'240u, 20'000u}) {
        const core::string made = Format("%s", std::string(length, 'x').c_str());
        EXPECT_EQ(made, std::string(std::min<size_t>(length, 10'239), 'x').c_str()) << length;
        EXPECT_EQ(made.get_memory_label(), MemLabelId(kMemLabelGeneral));
    }
}
