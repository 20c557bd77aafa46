// Makes one archive, and tells what becomes of each entry: what zarvo_create and zarvo_writer_write have in common.
//
//   Creation creation(options, how);
//   creation.Begin("game.zarvo", failure);
//   creation.AddFolder(&folder, "game", failure);   // or AddEntries
//   creation.Write(&folder, failure);
#pragma once

#include "Library/Writer/FolderEntries.h"
#include "Library/Writer/WritePlan.h"

class Creation : private NonCopyable {
public:
    // path: of the archive. options and how: as the caller gave them. All three must outlive the object.
    Creation(const char* path, const zarvo_run_options& options, const zarvo_create_options& how)
        : m_Path(path), m_Options(options), m_How(how) {}

    // Call this first, and then one of the next two, which find the place for the archive.
    zarvo_code ReadOptions(Failure* failure) { return m_Plan.ReadOptions(m_How, failure); }

    // Adds what is in a folder. A failure of the folder itself is told as one of the entry "", before the archive's
    // place is looked at.
    zarvo_code AddFolder(FolderEntries* folder, const char* path, Failure* failure);

    // Takes a copy of entries from elsewhere, and refuses those that can't be together.
    zarvo_code AddEntries(const EntryList& entries, Failure* failure);

    zarvo_code Write(EntrySource* source, Failure* failure);

    const zarvo_summary& Summary() const { return m_Summary; }

private:
    // Why an entry is left out, beside the reasons of FolderEntries.
    static constexpr UInt32 kNoFolders = FolderEntries::kReasonCount;

    zarvo_code FindPlace(Failure* failure);
    zarvo_code Settle(Failure* failure);
    [[nodiscard]] bool LeaveOutFolders();
    void MarkFoldersOfFiles();
    void TellLeftOut();
    zarvo_code CheckCanWrite(EntrySource* source, Failure* failure);
    zarvo_code WriteFile(EntrySource* source, Failure* failure);
    void TellDone();
    void TellFailed(core::string_ref path, bool isFolder, const Failure& failure);
    zarvo_code FailEntry(size_t index, const Failure& failure);
    void Tell(core::string_ref path, bool isFolder, SInt32 outcome, const Failure& failure);

    const char* const m_Path;
    const zarvo_run_options& m_Options;
    const zarvo_create_options& m_How;
    WritePlan m_Plan;
    NewArchive m_File;
    EntryList m_Entries;
    EntryList m_LeftOut; // the reason is each one's source
    zarvo_summary m_Summary = ZARVO_SUMMARY_INIT;
};
