// Takes what the runtime reports while the library works (failed checks, unsupported kinds of compression) to the
// caller's log function. Reports may be made while locks are held, so each thread collects its own. They are told when
// the public call ends, on its thread, with no lock held.
//
//   MessageScope scope(archive->Messages());   // at the start of a public call
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Threads/Mutex.h"

// Where an archive's messages go. Any thread.
class MessageLog : private NonCopyable {
public:
    using Function = void (*)(void* context, const char* message);

    // function may be null: messages are dropped.
    MessageLog(Function function, void* context) : m_Function(function), m_Context(context) {}

    // Tells the message unless it has been told before. Calls the caller's function: hold no lock.
    void Tell(const core::string& message);

private:
    bool IsNew(const core::string& message);

    Function m_Function;
    void* m_Context;
    Mutex m_Lock;
    dynamic_array<UInt64> m_Told VARNEX_GUARDED_BY(m_Lock); // hashes
};

// Hands what the worker threads of a call have collected to the thread that made the call. Any thread.
class MessageQueue : private NonCopyable {
public:
    void Add(dynamic_array<core::string>* messages);

    // Tells them sorted: the order in which they came depends on the threads.
    void TellAll(MessageLog* log);

private:
    Mutex m_Lock;
    dynamic_array<core::string> m_Messages VARNEX_GUARDED_BY(m_Lock);
};

// Collects this thread's reports as long as it exists. Scopes nest: the innermost collects.
class MessageScope : private NonCopyable {
public:
    explicit MessageScope(MessageLog* log);     // tells them when it is destroyed
    explicit MessageScope(MessageQueue* queue); // adds them to the queue when it is destroyed
    ~MessageScope();

private:
    friend struct MessageHook;

    MessageLog* m_Log = nullptr;
    MessageQueue* m_Queue = nullptr;
    MessageScope* m_Outer;
    dynamic_array<core::string> m_Collected;
};

// Takes over the runtime's reports: from here on, none reaches the program's output. Call it before using the runtime.
void InstallMessageHook();
