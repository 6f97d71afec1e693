// transfer_encoding.cpp - see transfer_encoding.h.
#include "transfer_encoding.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <new>

#include <zuv_client_pro/soap_attachment.h>

namespace service {

namespace {

// Line breaks and blanks may be anywhere; another character, bytes after the padding or an incomplete last
// group are errors.
class base64_decoder : public transfer_decoder {
public:
    base64_decoder() : state_(EVP_ENCODE_CTX_new())
    {
        if (state_ == nullptr)
            throw std::bad_alloc();
        EVP_DecodeInit(state_.get());
    }

    const char *name() const override { return "base64"; }

    bool decode(const char *data, std::size_t length, std::string &out) override
    {
        for (std::size_t part = 0; length > 0; data += part, length -= part) {
            part = std::min(length, STRETCH);
            if (!decode_stretch(data, static_cast<int>(part), out))
                return false;
        }
        return true;
    }

    bool finish(std::string &) override
    {
        unsigned char rest[3];
        int length = 0;
        return EVP_DecodeFinal(state_.get(), rest, &length) >= 0;
    }

private:
    static constexpr std::size_t STRETCH = 4096; // characters decoded at once
    struct deleter {
        void operator()(EVP_ENCODE_CTX *state) const { EVP_ENCODE_CTX_free(state); }
    };

    bool decode_stretch(const char *data, int length, std::string &out)
    {
        const char *const end = data + length;
        const bool is_blank = std::all_of(data, end, [](char c) { return std::strchr(" \t\r\n", c) && c; });
        if (ended_)
            return is_blank;
        if (std::memchr(data, '-', static_cast<std::size_t>(length)) != nullptr)
            return false; // which would look like the end
        unsigned char decoded[STRETCH];
        int count = 0;
        const int result = EVP_DecodeUpdate(state_.get(), decoded, &count,
                                            reinterpret_cast<const unsigned char *>(data), length);
        if (result < 0)
            return false;
        out.append(reinterpret_cast<const char *>(decoded), static_cast<std::size_t>(count));
        ended_ = result == 0;
        return true;
    }

    std::unique_ptr<EVP_ENCODE_CTX, deleter> state_;
    bool ended_ = false; // the padding was read
};

// Lines may be longer than an encoder makes them; an equals sign that begins neither a byte nor a soft line
// break is an error.
class quoted_printable_decoder : public transfer_decoder {
public:
    const char *name() const override { return "quoted-printable"; }

    bool decode(const char *data, std::size_t length, std::string &out) override
    {
        return std::all_of(data, data + length, [&](char c) { return take(c, out); });
    }

    bool finish(std::string &out) override
    {
        if (state_ == state::line_end)
            out += '\r';
        return state_ != state::second_digit; // a soft line break may end the part, whose own follows
    }

private:
    enum class state { text, line_end, escape, second_digit, soft_break, soft_line_end };
    static constexpr std::size_t BLANKS_MAX = 998; // in a row; a line of a mail has no more characters

    static int digit(char c)
    {
        if (std::isxdigit(static_cast<unsigned char>(c)) == 0)
            return -1;
        return c <= '9' ? c - '0' : (c & 7) + 9;
    }

    bool take(char c, std::string &out)
    {
        switch (state_) {
        case state::text:
            return take_text(c, out);
        case state::line_end: // after a carriage return
            state_ = state::text;
            if (c != '\n')
                flush(out);
            blanks_.clear();
            out += '\r';
            return take_text(c, out);
        case state::escape:
            if (digit(c) < 0)
                return take_soft_break(c);
            high_ = digit(c);
            state_ = state::second_digit;
            return true;
        case state::second_digit:
            state_ = state::text;
            out += static_cast<char>(high_ << 4 | digit(c));
            return digit(c) >= 0;
        case state::soft_break:
            return take_soft_break(c);
        case state::soft_line_end:
            state_ = state::text;
            return c == '\n';
        }
        return false;
    }

    // Blanks at the end of a line were added in transport.
    bool take_text(char c, std::string &out)
    {
        if (c == ' ' || c == '\t') {
            blanks_ += c;
            return blanks_.size() <= BLANKS_MAX;
        }
        if (c == '\r') {
            state_ = state::line_end;
            return true;
        }
        if (c == '\n')
            blanks_.clear();
        flush(out);
        if (c == '=')
            state_ = state::escape;
        else
            out += c;
        return true;
    }

    bool take_soft_break(char c)
    {
        state_ = c == '\r' ? state::soft_line_end : c == '\n' ? state::text : state::soft_break;
        return std::strchr("\r\n \t", c) != nullptr && c != '\0';
    }

    void flush(std::string &out)
    {
        out += blanks_;
        blanks_.clear();
    }

    state state_ = state::text;
    int high_ = 0;
    std::string blanks_; // that may be the last of their line
};

} // namespace

std::unique_ptr<transfer_decoder> transfer_decoder::of(int encoding)
{
    if (encoding == MIME_BASE64)
        return std::make_unique<base64_decoder>();
    if (encoding == MIME_QUOTED_PRINTABLE)
        return std::make_unique<quoted_printable_decoder>();
    return nullptr;
}

} // namespace service
