// What the tests of the library share: archives in memory, sources that count and fail, and a user without rights.
#pragma once

#include "Library/include/zarvo.hpp"
#include "Runtime/Core/NonCopyable.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <functional>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <unistd.h>
#include <vector>

// While it is there, the superuser, who may do everything, is somebody else.
class OrdinaryUser : private NonCopyable {
public:
    OrdinaryUser() : m_User(geteuid()) {
        if (m_User == 0) {
            EXPECT_EQ(0, seteuid(65'534));
        }
    }
    ~OrdinaryUser() { EXPECT_EQ(0, seteuid(m_User)); }

private:
    const uid_t m_User;
};

inline std::span<const std::byte> BytesOf(const std::string& text) { return std::as_bytes(std::span(text)); }

// A text that compresses, and holds no piece of itself twice at places that matter.
inline std::string SampleText(size_t size) {
    std::string text;
    for (size_t line = 0; text.size() < size; ++line)
        text += std::to_string(line * line) + ",line " + std::to_string(line) + "\n";
    text.resize(size);
    return text;
}

// What a read gave: the bytes, and the code of the failure that ended it.
struct Delivered {
    std::string bytes;
    zarvo_code code = ZARVO_OK;

    friend bool operator==(const Delivered&, const Delivered&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Delivered& delivered) {
        return out << delivered.bytes.size() << " bytes and code " << delivered.code << ": "
                   << testing::PrintToString(delivered.bytes.substr(0, 200));
    }
};

inline Delivered Read(zarvo::archive& archive, uint64_t index, uint64_t offset, size_t size) {
    Delivered delivered{std::string(size, '?')};
    const zarvo::read_result read = archive.read(index, offset, std::as_writable_bytes(std::span(delivered.bytes)));
    delivered.bytes.resize(read.count);
    delivered.code = read.error.code();
    return delivered;
}

inline Delivered ReadNext(zarvo::stream& stream, size_t size) {
    Delivered delivered{std::string(size, '?')};
    const zarvo::read_result read = stream.read(std::as_writable_bytes(std::span(delivered.bytes)));
    delivered.bytes.resize(read.count);
    delivered.code = read.error.code();
    return delivered;
}

// An archive that opens, or the test fails and stops. bytes must outlive it.
inline zarvo::archive OpenBytes(const std::string& bytes, zarvo::open_options options = {}) {
    zarvo::result<zarvo::archive> opened = zarvo::archive::open(BytesOf(bytes), std::move(options));
    if (!opened) {
        ADD_FAILURE() << opened.error().text();
        throw std::runtime_error("the archive does not open");
    }
    return std::move(*opened);
}

// Bytes on a medium with pages of 4,096 bytes, some of which can't be read. A read that meets one of them delivers
// nothing, or, from a medium that can say so, the bytes before it.
struct DamagedMedium final : zarvo::source {
    DamagedMedium(std::string served, std::vector<size_t> badPages, bool isExact)
        : bytes(std::move(served)), bad(std::move(badPages)), deliversBytesBefore(isExact) {}

    int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
        size_t count = std::min<uint64_t>(buffer.size(), bytes.size() - std::min<uint64_t>(offset, bytes.size()));
        for (const size_t page : bad)
            if (offset < (page + 1) * 4'096 && offset + count > page * 4'096) {
                if (!deliversBytesBefore || offset >= page * 4'096) return -EIO;
                count = page * 4'096 - offset;
            }
        memcpy(buffer.data(), bytes.data() + offset, count);
        return static_cast<int64_t>(count);
    }
    int64_t size() override { return static_cast<int64_t>(bytes.size()); }

    const std::string bytes;
    const std::vector<size_t> bad; // in order
    const bool deliversBytesBefore;
};

// Bytes that are served by callbacks. The counts, and what the reads do, are the test's while no call is under way.
struct CountingSource final : zarvo::source {
    explicit CountingSource(std::string served) : bytes(std::move(served)) {}

    int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
        if (beforeRead) beforeRead();
        if (++reads == failingRead) return -ETIMEDOUT;
        const size_t start = std::min<uint64_t>(offset, bytes.size());
        const size_t count = std::min({buffer.size(), bytes.size() - start, longestRead});
        memcpy(buffer.data(), bytes.data() + start, count);
        bytesRead += count;
        return static_cast<int64_t>(count);
    }
    int64_t size() override { return claimedSize >= 0 ? claimedSize : static_cast<int64_t>(bytes.size()); }

    std::string bytes;
    int64_t claimedSize = -1; // where not negative, instead of the true one
    int failingRead = 0;      // the read with this number, from 1 on, fails
    size_t longestRead = SIZE_MAX;
    std::function<void()> beforeRead = {};
    std::atomic<int> reads = 0;
    std::atomic<uint64_t> bytesRead = 0;
};
