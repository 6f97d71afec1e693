// attachment_exchange.h - small SOAP messages with binary values next to them, written and read. A message is
// an Envelope whose Body holds elements "data". For tests and fuzz targets of attachments; the expectations
// of the tests are in attachment_checks.h.
#pragma once

#include "support/memory_wire.h"

namespace attachment_exchange {

constexpr int VALUE_TYPE = 10;           // type id of the values
constexpr int LENGTH_DIFFERS = -1000000; // result of send: not the length that was counted before
constexpr char ENVELOPE_URI[] = "http://schemas.xmlsoap.org/soap/envelope/";

inline std::string envelope(const std::string &body)
{
    return std::string("<SOAP-ENV:Envelope xmlns:SOAP-ENV=\"") + ENVELOPE_URI + "\"><SOAP-ENV:Body>" + body +
           "</SOAP-ENV:Body></SOAP-ENV:Envelope>\r\n";
}

struct value : xsd__base64Binary {
    std::string bytes() const
    {
        return content == nullptr
                   ? "(null)"
                   : std::string(reinterpret_cast<char *>(content), static_cast<std::size_t>(size));
    }
};

// A value to send; the texts must live as long as it.
inline value make_value(const std::string &bytes, const char *id, const char *type,
                        const char *options = nullptr)
{
    value v;
    v.content = reinterpret_cast<unsigned char *>(const_cast<char *>(bytes.data()));
    v.size = static_cast<int>(bytes.size());
    v.id = const_cast<char *>(id);
    v.type = const_cast<char *>(type);
    v.options = const_cast<char *>(options);
    return v;
}

inline int write_message(soap *ctx, const std::deque<value> &values)
{
    if (soap_envelope_out_begin(ctx) != 0 || soap_body_out_begin(ctx) != 0)
        return ctx->error;
    for (const value &v : values) {
        if (v.soap_out(ctx, "data", 0, nullptr) != 0)
            return ctx->error;
    }
    if (soap_body_out_end(ctx) != 0)
        return ctx->error;
    return soap_envelope_out_end(ctx);
}

// The marking pass of a message, and the counting pass if there is one.
inline int prepare(memory_wire &wire, const std::deque<value> &values, bool &counts)
{
    wire.encoding_style = nullptr;
    soap_reset_call(&wire);
    for (const value &v : values)
        v.soap_serialize(&wire);
    if (soap_count_begin(&wire) != 0)
        return wire.error;
    counts = (wire.mode & MODE_COUNTING) != 0;
    if (counts && write_message(&wire, values) != 0)
        return wire.error;
    return soap_count_end(&wire);
}

// Both passes of a message without HTTP. 0, the context's error, or LENGTH_DIFFERS.
inline int send(memory_wire &wire, const std::deque<value> &values, bool length_is_known = true)
{
    bool counts = false;
    if (prepare(wire, values, counts) != 0)
        return wire.error;
    const std::uint64_t length = soap_message_length(&wire);
    if (soap_send_begin(&wire) != 0 || write_message(&wire, values) != 0 || soap_send_finish(&wire) != 0)
        return wire.error;
    return counts && length_is_known && length != wire.sent().size() ? LENGTH_DIFFERS : 0;
}

// A whole HTTP request that goes nowhere.
inline int send_request(memory_wire &wire, const std::deque<value> &values)
{
    wire.on_open = [](soap *, const char *, const char *, int) { return -1; };
    bool counts = false;
    if (prepare(wire, values, counts) != 0 || soap_server_connect(&wire, "http://host/path", "") != 0 ||
        write_message(&wire, values) != 0)
        return wire.error;
    return soap_send_finish(&wire);
}

inline int read_values(soap *ctx, std::deque<value> &values)
{
    while (values.emplace_back().soap_in(ctx, "data", nullptr) != nullptr) {
    }
    if (ctx->error != SOAP_NO_TAG)
        return ctx->error;
    values.pop_back();
    return ctx->error = 0;
}

// One reception of a message. The values lie in a deque, as references keep their addresses.
struct reception {
    explicit reception(const std::string &bytes, std::uint32_t mode = 0, std::size_t first = 65536,
                       std::size_t piece = 65536)
    {
        wire->input_mode = mode;
        wire->receive(bytes, first, piece);
    }
    int run()
    {
        soap *const ctx = wire.get();
        soap_reset_call(ctx);
        if (soap_receive_begin(ctx) != 0 || soap_envelope_in_begin(ctx) != 0 ||
            soap_body_in_begin(ctx) != 0 || read_values(ctx, values) != 0 || soap_body_in_end(ctx) != 0 ||
            soap_envelope_in_end(ctx) != 0)
            return ctx->error;
        return soap_receive_finish(ctx);
    }
    // What was received, as one text; a failure as "!code".
    std::string summary()
    {
        if (const int error = run())
            return "!" + std::to_string(error);
        std::string all;
        for (const value &v : values)
            all += "[" + text_of(v.id) + " " + text_of(v.type) + " " + v.bytes() + "]";
        return all;
    }

    std::unique_ptr<memory_wire> wire = std::make_unique<memory_wire>();
    std::deque<value> values;
};

} // namespace attachment_exchange
