#pragma once

#include <cerrno>
#include <ostream>
#include <streambuf>

namespace VexaTouch::Tools {

/// Keeps, for as long as it lives, why the first write of a stream failed: the stream itself only
/// knows that one did, and the system's number is soon another's. Everything goes through
/// unchanged. One thread.
class FaultKeeper final : public std::streambuf {
public:
    explicit FaultKeeper(std::ostream& stream) : stream_(stream), under_(stream.rdbuf()) {
        exchange(this);
    }
    ~FaultKeeper() override { exchange(under_); }
    FaultKeeper(const FaultKeeper&) = delete;
    FaultKeeper(FaultKeeper&&) = delete;
    FaultKeeper& operator=(const FaultKeeper&) = delete;
    FaultKeeper& operator=(FaultKeeper&&) = delete;

    /// The system's number; 0: nothing failed, or nobody said why.
    [[nodiscard]] int error() const noexcept { return error_; }

protected:
    int_type overflow(int_type character) override {
        if (traits_type::eq_int_type(character, traits_type::eof())) {
            return traits_type::not_eof(character);
        }
        errno = 0;
        const int_type put = under_->sputc(traits_type::to_char_type(character));
        note(!traits_type::eq_int_type(put, traits_type::eof()));
        return put;
    }
    std::streamsize xsputn(const char* text, std::streamsize length) override {
        errno = 0;
        const std::streamsize put = under_->sputn(text, length);
        note(put == length);
        return put;
    }
    int sync() override {
        errno = 0;
        const int result = under_->pubsync();
        note(result == 0);
        return result;
    }

private:
    void note(bool isGood) noexcept {
        if (!isGood && !failed_) {
            failed_ = true;
            error_ = errno;
        }
    }

    // A stream that is given a buffer forgets that it failed.
    void exchange(std::streambuf* buffer) {
        const std::ios::iostate state = stream_.rdstate();
        stream_.rdbuf(buffer);
        stream_.setstate(state);
    }

    std::ostream& stream_;
    std::streambuf* const under_;
    bool failed_ = false;
    int error_ = 0;
};

}  // namespace VexaTouch::Tools
