// trace_body.cpp - see trace_body.h.
#include "trace_body.h"

#include <algorithm>
#include <cstring>
#include <vector>

#include <zlib.h>

namespace cli {

namespace {

constexpr std::size_t CERTAIN = 16; // bytes of plain text that can't follow raw bytes by chance

// Separates framing bytes from data.
class deframer {
public:
    explicit deframer(const body_framing &framing)
        : chunked_(framing.chunked), known_(framing.length_known), left_(framing.chunked ? 0 : framing.length)
    {}

    bool ended() const { return ended_ || (!chunked_ && known_ && left_ == 0); }
    bool broken() const { return broken_; }

    // How many of the next bytes are data for certain.
    std::size_t data_size(std::size_t available) const
    {
        if (chunked_ ? state_ != state::data : !known_)
            return chunked_ ? 0 : available;
        return static_cast<std::size_t>(std::min<std::uint64_t>(available, left_));
    }
    void take_data(std::size_t size)
    {
        left_ -= known_ || chunked_ ? size : 0;
        if (chunked_ && size != 0 && left_ == 0)
            state_ = state::line_end;
    }

    // True if the byte is data.
    bool take(char c)
    {
        const bool data = data_size(1) != 0;
        if (data)
            take_data(1);
        else
            take_framing(c);
        return data;
    }

private:
    enum class state { line_end, size, extension, data, trailer };

    void take_framing(char c)
    {
        switch (state_) {
        case state::line_end: // after a chunk
            broken_ = broken_ || (c != '\r' && c != '\n');
            if (c == '\n')
                begin_size();
            return;
        case state::size:
            if (const int digit = hexadecimal(c); digit >= 0 && digits_ < 15) {
                left_ = left_ << 4 | static_cast<unsigned>(digit);
                ++digits_;
                return;
            }
            state_ = state::extension;
            [[fallthrough]];
        case state::extension:
            broken_ = broken_ || digits_ == 0;
            if (c == '\n')
                state_ = left_ == 0 ? state::trailer : state::data;
            return;
        case state::trailer:
            if (c == '\n' && line_length_ == 0)
                ended_ = true;
            line_length_ = c == '\n' ? 0 : c == '\r' ? line_length_ : line_length_ + 1;
            return;
        case state::data:
            return;
        }
    }
    void begin_size()
    {
        state_ = state::size;
        left_ = 0;
        digits_ = 0;
    }
    static int hexadecimal(char c)
    {
        if (c >= '0' && c <= '9')
            return c - '0';
        const char lower = static_cast<char>(c | 0x20);
        return lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
    }

    bool chunked_, known_, ended_ = false, broken_ = false;
    std::uint64_t left_;
    state state_ = state::size;
    int digits_ = 0;
    std::size_t line_length_ = 0;
};

// Decompresses gzip, zlib or bare deflate, whichever the first bytes are.
class inflater {
public:
    inflater() = default;
    inflater(const inflater &) = delete;
    inflater &operator=(const inflater &) = delete;
    ~inflater()
    {
        if (open_)
            inflateEnd(&stream_);
    }
    bool ended() const { return ended_; }

    // Appends what a piece of raw bytes decompresses to. False if it is no compressed data, or too much.
    bool feed(std::string_view raw, std::string &out, trace_budget &budget)
    {
        if (ended_ || raw.empty())
            return true;
        if (!open_ && !open(static_cast<unsigned char>(raw[0])))
            return false;
        stream_.next_in = reinterpret_cast<Bytef *>(const_cast<char *>(raw.data()));
        stream_.avail_in = static_cast<uInt>(raw.size());
        char piece[16384];
        do {
            stream_.next_out = reinterpret_cast<Bytef *>(piece);
            stream_.avail_out = sizeof piece;
            const int result = inflate(&stream_, Z_NO_FLUSH);
            const std::size_t made = sizeof piece - stream_.avail_out;
            if (made > budget.inflated)
                return false;
            budget.inflated -= made;
            out.append(piece, made);
            ended_ = result == Z_STREAM_END;
            if (result != Z_OK && result != Z_BUF_ERROR && !ended_)
                return false;
        } while (!ended_ && stream_.avail_out == 0);
        return true;
    }

private:
    bool open(unsigned char first)
    {
        constexpr int GZIP_OR_ZLIB = 15 + 32, BARE = -15;
        const bool wrapped = first == 0x1F || (first & 0x0FU) == 8;
        open_ = inflateInit2(&stream_, wrapped ? GZIP_OR_ZLIB : BARE) == Z_OK;
        return open_;
    }
    z_stream stream_{};
    bool open_ = false, ended_ = false;
};

trace_body read_plain(std::string_view trace, std::size_t begin, const body_framing &framing)
{
    trace_body body;
    deframer frame(framing);
    std::size_t at = begin;
    while (at < trace.size() && !frame.ended() && !frame.broken()) {
        const std::size_t data = frame.data_size(trace.size() - at);
        body.bytes.append(trace.substr(at, data));
        frame.take_data(data);
        if (data == 0)
            frame.take(trace[at]);
        at += std::max<std::size_t>(data, 1);
    }
    body.end = at;
    body.complete = frame.ended() && !frame.broken();
    return body;
}

trace_body inflated(trace_body body, trace_budget &budget)
{
    std::string plain;
    inflater undo;
    body.complete = undo.feed(body.bytes, plain, budget) && undo.ended() && body.complete;
    body.bytes = std::move(plain);
    return body;
}

// Raw bytes with plain copies between. After each byte it is checked whether the text made since the last
// copy follows.
trace_body read_with_copies(std::string_view trace, std::size_t begin, const body_framing &framing,
                            trace_budget &budget)
{
    trace_body body;
    deframer frame(framing);
    inflater undo;
    std::size_t at = begin, copied = 0; // `copied`: bytes of the body whose copy was found
    const auto skip_copy = [&] {
        const std::size_t pending = body.bytes.size() - copied;
        const bool certain = pending >= CERTAIN || (pending != 0 && (undo.ended() || frame.ended()));
        if (!certain || pending > trace.size() - at || trace[at] != body.bytes[copied] ||
            pending > budget.compared)
            return;
        const bool starts_so =
            std::memcmp(trace.data() + at, body.bytes.data() + copied, std::min(pending, CERTAIN)) == 0;
        if (!starts_so)
            return;
        budget.compared -= pending;
        if (std::memcmp(trace.data() + at, body.bytes.data() + copied, pending) == 0) {
            at += pending;
            copied = body.bytes.size();
        }
    };
    while (at < trace.size() && !frame.ended() && !frame.broken()) {
        const bool data = frame.take(trace[at]);
        if (data && !undo.feed(trace.substr(at, 1), body.bytes, budget)) {
            body.complete = false;
            break;
        }
        ++at;
        if (at < trace.size())
            skip_copy();
    }
    body.end = at;
    body.complete = body.complete && undo.ended() && frame.ended() && !frame.broken();
    return body;
}

} // namespace

trace_body read_trace_body(std::string_view trace, std::size_t begin, const body_framing &framing,
                           trace_budget &budget)
{
    if (framing.compressed && framing.received)
        return read_with_copies(trace, begin, framing, budget);
    trace_body body = read_plain(trace, begin, framing);
    return framing.compressed ? inflated(std::move(body), budget) : body;
}

} // namespace cli
