#include "Runtime/Utilities/Format.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/MutexInspector.h"
#include "Tests/Support/RefusedMemory.h"

#include <algorithm>
#include <csignal>
#include <gtest/gtest.h>

TEST(Format, LongResultIsCut) {
    const std::string cut(10'239, 'x');
    EXPECT_EQ(cut, Format("%sxx", cut.c_str()).c_str());
}

TEST(LogAssert, MessageEndsWithOneNewlineAtLeast) {
    struct Case {
        const char* message;
        const char* printed;
    };
    constexpr Case kCases[] = {
        {.message = "", .printed = "\n"},
        {.message = "text", .printed = "text\n"},
        {.message = "text\n\n", .printed = "text\n\n"},
        {.message = "100% %n, and long enough for the heap", .printed = "100% %n, and long enough for the heap\n"},
    };
    for (const Case& row : kCases) {
        const ConsoleCapture console;
        ReportError(row.message);
        EXPECT_EQ(row.printed, console.Text());
    }
}

TEST(LogAssert, ConsolePrintAddsNothing) {
    const ConsoleCapture console;
    printf_console("%d", 5);
    EXPECT_EQ("5", console.Text());
}

TEST(LogAssert, HandlerDecidesWhatIsPrinted) {
    const ConsoleCapture console;
    gCurrentLogEntryHandler = [](LogType type, const char*, va_list) { return type == kLogTypeAssert; };
    ReportError("error");
    ReportFailedCheck("check");
    printf_console("print");
    gCurrentLogEntryHandler = nullptr;
    EXPECT_EQ("check\n", console.Text());
}

// What a report says of itself.
struct Record {
    std::string message;
    std::string file;
    int line;
    int column = -1;
    UInt32 mode;
    int identifier = 0;

    friend bool operator==(const Record&, const Record&) = default;
    friend void PrintTo(const Record& it, std::ostream* out) {
        *out << it.file << ':' << it.line << ':' << it.column << ": " << it.message << ", mode " << it.mode
             << ", identifier " << it.identifier;
    }
};

// What the hooks were told of the last record. Nothing is printed: the handler of console prints takes it all.
struct Told {
    LogType type, console;      // given to the clean log handlers, and to the handler of console prints
    std::string clean, printed; // the texts that these two got
    Record record;              // that is forwarded
    std::string order;          // clean log handlers (c, d), console (p), and the two forward functions (f, g)
    bool isListLocked;          // by this thread, when a clean log handler was called
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
            s_Told.record = {.message = data.message,
                             .file = data.file,
                             .line = data.line,
                             .column = data.column,
                             .mode = data.mode,
                             .identifier = data.identifier};
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
        s_Told.isListLocked = MutexInspector::IsLockedByCurrentThread(g_LogHandlerListMutex);
    }
    static void TellSecond(LogType, const char*, va_list) { s_Told.order += 'd'; }

    CleanLogEntryHandlerNode m_Second{&m_Anchor, TellSecond};
    CleanLogEntryHandlerNode m_First{&m_Second, TellFirst};
    CleanLogEntryHandlerNode m_Anchor{&m_First, nullptr};
    StackTraceLogType m_Table[kLogTypeCount];
};

TEST_F(LogHooks, ModeBitsChooseTypeAndConsole) {
    struct Case {
        UInt32 mode;
        LogType type, console;
    };
    // 0x10, which is fatal, has a test of its own.
    constexpr Case kCases[] = {
        {.mode = 0x0, .type = kLogTypeLog, .console = kLogTypeError},
        {.mode = 0x1, .type = kLogTypeError, .console = kLogTypeError},
        {.mode = 0x2, .type = kLogTypeAssert, .console = kLogTypeAssert},
        {.mode = 0x4, .type = kLogTypeLog, .console = kLogTypeLog},
        {.mode = 0x40, .type = kLogTypeError, .console = kLogTypeError},
        {.mode = 0x80, .type = kLogTypeWarning, .console = kLogTypeWarning},
        {.mode = 0x100, .type = kLogTypeError, .console = kLogTypeError},
        {.mode = 0x200, .type = kLogTypeWarning, .console = kLogTypeWarning},
        {.mode = 0x400, .type = kLogTypeLog, .console = kLogTypeLog},
        {.mode = 0x800, .type = kLogTypeError, .console = kLogTypeError},
        {.mode = 0x1000, .type = kLogTypeWarning, .console = kLogTypeError},
        {.mode = 0x20000, .type = kLogTypeException, .console = kLogTypeError},
        {.mode = 0x200000, .type = kLogTypeAssert, .console = kLogTypeAssert},
        // Of several bits, the first that matches counts; the order is another one for the console.
        {.mode = 0x3, .type = kLogTypeError, .console = kLogTypeAssert},
        {.mode = 0x82, .type = kLogTypeAssert, .console = kLogTypeWarning},
        {.mode = 0x284, .type = kLogTypeWarning, .console = kLogTypeLog},
        {.mode = 0x20003, .type = kLogTypeException, .console = kLogTypeAssert},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << "mode 0x" << std::hex << row.mode);
        DebugStringToFile({.mode = row.mode});
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

TEST_F(LogHooks, NativeTraceIsATextInPlaceOfThePosition) {
    std::fill_n(gStackTraceLogType, kLogTypeCount, kStackTraceNative);
    DebugStringToFileData data = {.message = "text", .file = "file", .line = 12, .mode = kLogModeAssert};
    DebugStringToFile(data);
    EXPECT_EQ("Assertion failed: text\nStacktrace is not supported on this platform.\n\n", s_Told.clean);
    EXPECT_EQ("text\nStacktrace is not supported on this platform.\n\n", s_Told.printed);
    EXPECT_EQ((Record{.message = "text", .file = "file", .line = 12, .mode = 2}), s_Told.record);

    data.mode |= kLogModeShowSourcePosition;
    DebugStringToFile(data);
    EXPECT_EQ((Record{.message = "text", .file = "", .line = 0, .mode = data.mode}), s_Told.record);
}

TEST_F(LogHooks, TraceIsPrintedAsAParagraph) {
    for (const char* const trace : {"at", "\nat", "at\n", "\nat\n"}) {
        DebugStringToFile({.message = "text", .stackTrace = trace, .mode = kLogModeError | kLogModeKeepStackTrace});
        EXPECT_EQ("text\nat\n\n", s_Told.printed) << trace;
    }
}

TEST_F(LogHooks, PositionIsPrintedAfterATrace) {
    struct Case {
        const char* trace;
        const char* file;
        SInt32 line;
        const char* printed;
    };
    constexpr Case kCases[] = {
        {.trace = "at", .file = "file", .line = 12, .printed = "text\nat\n\n(Filename: file Line: 12)\n\n"},
        {.trace = "at", .file = "file", .line = 0, .printed = "text\nat\n\n"},
        {.trace = "at", .file = "", .line = 12, .printed = "text\nat\n\n"},
        {.trace = "at", .file = "in Debug.bindings", .line = 12, .printed = "text\nat\n\n"},
        {.trace = "", .file = "file", .line = 12, .printed = "text\n"},
    };
    for (const Case& row : kCases) {
        DebugStringToFile({.message = "text",
                           .stackTrace = row.trace,
                           .file = row.file,
                           .line = row.line,
                           .mode = kLogModeError | kLogModeKeepStackTrace | kLogModeShowSourcePosition});
        EXPECT_EQ(row.printed, s_Told.printed) << row.file << ", line " << row.line;
    }
}

TEST_F(LogHooks, PreprocessorMayReplaceThePosition) {
    gPreprocessor = [](const DebugStringToFileData&, core::string*, core::string* trace, core::string* file,
                       SInt32* line) {
        *trace = "at";
        *file = "made";
        *line += 1;
    };
    DebugStringToFile(
        {.message = "text", .file = "file", .line = 12, .mode = kLogModeError | kLogModeShowSourcePosition});
    EXPECT_EQ("text\nat\n\n(Filename: made Line: 13)\n\n", s_Told.printed);
}

TEST_F(LogHooks, SecondStageTakesTheTracesAsTheyAre) {
    DebugStringToFilePostprocessedStacktrace(
        {.message = "text", .shortStackTrace = "short", .stackTrace = "at", .mode = kLogModeAssert});
    EXPECT_EQ("Assertion failed: text\nshort\n\n", s_Told.clean);
    EXPECT_EQ("text\nat\n\n", s_Told.printed);
}

TEST_F(LogHooks, AreToldInTheirOrder) {
    ReportError("text");
    EXPECT_EQ("cdpfg", s_Told.order);
}

TEST_F(LogHooks, CleanHandlersAreCalledUnderTheLock) {
    EXPECT_FALSE(MutexInspector::IsLockedByCurrentThread(g_LogHandlerListMutex));
    ReportError("text");
    EXPECT_TRUE(s_Told.isListLocked);
    EXPECT_FALSE(MutexInspector::IsLockedByCurrentThread(g_LogHandlerListMutex));
}

TEST_F(LogHooks, EachReportFillsItsRecord) {
    Record expected = {.message = "text", .file = "file", .line = 12, .mode = 1};
    ReportError("text", {"file", 12});
    EXPECT_EQ(expected, s_Told.record);

    expected.mode = 2;
    EXPECT_FALSE(Check(false, "text", {"file", 12}));
    EXPECT_EQ(expected, s_Told.record);

    expected.column = 34;
    expected.identifier = 7;
    EXPECT_EQ(1, AssertImplementation(7, "file", 12, 34, "text"));
    EXPECT_EQ(expected, s_Told.record);
}

TEST_F(LogHooks, ACheckThatHoldsIsNotReported) {
    EXPECT_TRUE(Check(true, "text"));
    EXPECT_EQ("", s_Told.order);
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
