#include "Runtime/Utilities/Format.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/RefusedMemory.h"

#include <algorithm>
#include <csignal>
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

// What the hooks were told of the last record. Nothing is printed: the handler of console prints takes it all.
struct Told {
    LogType type, console;      // given to the clean log handlers, and to the handler of console prints
    std::string clean, printed; // the texts that these two got
    std::string file;           // of the record that is forwarded
    int line, column;
    std::string order; // clean log handlers (c, d), console (p), and the two forward functions (f, g)
    bool isListLocked; // by this thread, when a clean log handler was called
};

class LogHooks : public testing::Test {
protected:
    LogHooks() {
        s_Told = {};
        std::copy_n(gStackTraceLogType, kLogTypeCount, m_Table);
        SetList(&m_Anchor);
        gCurrentLogEntryHandler = [](LogType type, const char* format, va_list arguments) {
            s_Told.console = type;
            s_Told.printed = Print(format, arguments);
            s_Told.order += 'p';
            return false;
        };
        gLogToConsoleFunc = [](const DebugStringToFileData& data) {
            s_Told.file = data.file;
            s_Told.line = data.line;
            s_Told.column = data.column;
            s_Told.order += 'f';
        };
        gUtpLogFunc = [](const DebugStringToFileData&) { s_Told.order += 'g'; };
    }
    ~LogHooks() override {
        gUtpLogFunc = nullptr;
        gLogToConsoleFunc = nullptr;
        gCurrentLogEntryHandler = nullptr;
        gPreprocessor = nullptr;
        SetList(nullptr);
        std::copy_n(m_Table, kLogTypeCount, gStackTraceLogType);
    }

    static inline Told s_Told;

private:
    static std::string Print(const char* format, va_list arguments) {
        char buffer[512];
        vsnprintf(buffer, sizeof(buffer), format, arguments);
        return buffer;
    }
    static void SetList(CleanLogEntryHandlerNode* anchor) {
        Mutex::AutoLock lock(g_LogHandlerListMutex);
        gCleanLogEntryHandlers = anchor;
    }
    static void TellFirst(LogType type, const char* format, va_list arguments) {
        s_Told.type = type;
        s_Told.clean = Print(format, arguments);
        s_Told.order += 'c';
        s_Told.isListLocked = g_LogHandlerListMutex.IsLockedByCurrentThread();
    }
    static void TellSecond(LogType, const char*, va_list) { s_Told.order += 'd'; }

    CleanLogEntryHandlerNode m_Second{&m_Anchor, TellSecond};
    CleanLogEntryHandlerNode m_First{&m_Second, TellFirst};
    CleanLogEntryHandlerNode m_Anchor{&m_First, nullptr};
    StackTraceLogType m_Table[kLogTypeCount];
};

TEST_F(LogHooks, EachModeBitChoosesTypeAndConsole) {
    struct Case {
        UInt32 bit;
        LogType type, console;
    };
    // 0x10, which is fatal, has a test of its own.
    constexpr Case kCases[] = {
        {.bit = 0x0, .type = kLogTypeLog, .console = kLogTypeError},
        {.bit = 0x1, .type = kLogTypeError, .console = kLogTypeError},
        {.bit = 0x2, .type = kLogTypeAssert, .console = kLogTypeAssert},
        {.bit = 0x4, .type = kLogTypeLog, .console = kLogTypeLog},
        {.bit = 0x40, .type = kLogTypeError, .console = kLogTypeError},
        {.bit = 0x80, .type = kLogTypeWarning, .console = kLogTypeWarning},
        {.bit = 0x100, .type = kLogTypeError, .console = kLogTypeError},
        {.bit = 0x200, .type = kLogTypeWarning, .console = kLogTypeWarning},
        {.bit = 0x400, .type = kLogTypeLog, .console = kLogTypeLog},
        {.bit = 0x800, .type = kLogTypeError, .console = kLogTypeError},
        {.bit = 0x1000, .type = kLogTypeWarning, .console = kLogTypeError},
        {.bit = 0x20000, .type = kLogTypeException, .console = kLogTypeError},
        {.bit = 0x200000, .type = kLogTypeAssert, .console = kLogTypeAssert},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << "mode 0x" << std::hex << row.bit);
        DebugStringToFile({.mode = row.bit});
        EXPECT_EQ(row.type, s_Told.type);
        EXPECT_EQ(row.console, s_Told.console);
    }
}

// The record brings traces of its own, and the preprocessor makes others.
TEST_F(LogHooks, TableAndModeChooseTheTraces) {
    struct Case {
        UInt32 mode;
        StackTraceLogType table;
        const char* clean;
        const char* printed;
    };
    constexpr StackTraceLogType kNone = kStackTraceNone, kMade = kStackTracePreprocessed;
    // 0x300 shows whatever trace is left, 0x40000 empties both, 0x400000 keeps the record's.
    constexpr Case kCases[] = {
        {.mode = 0x2, .table = kMade, .clean = "Assertion failed: text\nmade short\n\n", .printed = "text\nmade\n\n"},
        {.mode = 0x40002, .table = kMade, .clean = "Assertion failed: text\n\n", .printed = "text\n"},
        {.mode = 0x400002,
         .table = kMade,
         .clean = "Assertion failed: text\nkept short\n\n",
         .printed = "text\nkept\n\n"},
        {.mode = 0x400002, .table = kNone, .clean = "Assertion failed: text\n\n", .printed = "text\n"},
        {.mode = 0x300, .table = kMade, .clean = "text\n\n", .printed = "text\nmade\n\n"},
        {.mode = 0x40300, .table = kMade, .clean = "text\n\n", .printed = "text\n"},
        {.mode = 0x400300, .table = kMade, .clean = "text\n\n", .printed = "text\nkept\n\n"},
        {.mode = 0x400300, .table = kNone, .clean = "text\n\n", .printed = "text\n"},
    };
    gPreprocessor = [](const DebugStringToFileData&, core::string* shortTrace, core::string* trace, core::string*,
                       SInt32*) {
        *shortTrace = "made short";
        *trace = "made";
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << "mode 0x" << std::hex << row.mode << ", table value " << row.table);
        std::fill_n(gStackTraceLogType, kLogTypeCount, row.table);
        DebugStringToFile({.message = "text", .shortStackTrace = "kept short", .stackTrace = "kept", .mode = row.mode});
        EXPECT_EQ(row.clean, s_Told.clean);
        EXPECT_EQ(row.printed, s_Told.printed);
    }
}

TEST_F(LogHooks, NativeTraceDropsThePositionThatIsAskedFor) {
    std::fill_n(gStackTraceLogType, kLogTypeCount, kStackTraceNative);
    DebugStringToFile({.message = "text", .file = "file", .line = 12, .mode = kLogModeError});
    EXPECT_EQ("file", s_Told.file);
    EXPECT_EQ(12, s_Told.line);

    DebugStringToFile(
        {.message = "text", .file = "file", .line = 12, .mode = kLogModeError | kLogModeShowSourcePosition});
    EXPECT_EQ("", s_Told.file);
    EXPECT_EQ(0, s_Told.line);
}

TEST_F(LogHooks, PositionIsPrintedOnlyWithALine) {
    constexpr UInt32 kMode = kLogModeError | kLogModeKeepStackTrace | kLogModeShowSourcePosition;
    DebugStringToFile({.message = "text", .stackTrace = "at", .file = "file", .line = 12, .mode = kMode});
    EXPECT_EQ("text\nat\n\n(Filename: file Line: 12)\n\n", s_Told.printed);

    DebugStringToFile({.message = "text", .stackTrace = "at", .file = "file", .line = 0, .mode = kMode});
    EXPECT_EQ("text\nat\n\n", s_Told.printed);
}

TEST_F(LogHooks, AreToldInTheirOrder) {
    ReportError("text");
    EXPECT_EQ("cdpfg", s_Told.order);
}

TEST_F(LogHooks, CleanHandlersAreCalledUnderTheListsLock) {
    EXPECT_FALSE(g_LogHandlerListMutex.IsLockedByCurrentThread());
    ReportError("text");
    EXPECT_TRUE(s_Told.isListLocked);
    EXPECT_FALSE(g_LogHandlerListMutex.IsLockedByCurrentThread());
}

TEST_F(LogHooks, AssertionCarriesItsColumn) {
    AssertImplementation(0, "file", 12, 34, "text");
    EXPECT_EQ(34, s_Told.column);
}

TEST_F(LogHooks, FatalErrorEndsTheProcessAfterItsOutput) {
    gUtpLogFunc = [](const DebugStringToFileData& data) {
        fprintf(stderr, "type %d: %s", s_Told.type, data.message); // which is what a death test sees
    };
    EXPECT_EXIT(DebugStringToFile({.message = "text", .mode = kLogModeFatal}), testing::KilledBySignal(SIGABRT),
                "type 0: text");
}

TEST(LogAssert, TextEndsItsLineWithoutMemory) {
    const std::string text(100, 'x'), trace(100, 'y'); // short ones need none
    const ConsoleCapture console;
    {
        const RefusedMemory refused(1, true);
        ReportError(text.c_str());
        DebugStringToFile({text.c_str(), "", "", trace.c_str(), "", 0, -1, kLogModeError | kLogModeKeepStackTrace});
    }
    EXPECT_TRUE(RefusedMemory::HasStruck());
    EXPECT_EQ(text + "\n" + text + "\n" + trace + "\n", console.Text());
}
