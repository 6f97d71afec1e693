// The samples of tests/samples: read, cut and changed; records whose lengths lie. And Python's email package at
// the other end: it splits what the library sends, and composes what the library reads.
#include "support/annotated_bytes.h"
#include "support/attachment_checks.h"
#include "support/dime_bytes.h"
#include "support/host_streams.h"
#include "support/python_batch.h"

using namespace attachment_exchange;

namespace {

std::string sample(const std::string &name)
{
    const std::string bytes = file_content(std::string(ZUV_SAMPLE_DIR) + "/" + name);
    EXPECT_NE(bytes, "") << name;
    return name.starts_with("dime/") ? annotated_bytes(bytes) : bytes;
}

// What is announced as encoded is handed out as it came: its receiver knows the encoding from the record.
// The message ends with the third text; anything after it is ignored.
const std::tuple<const char *, const char *, const char *> SAMPLES[] = {
    {"dime/two_attachments.txt", "[cid:a image/png pixels][b text/plain text]", ""},
    {"dime/chunks.txt", "[cid:big application/octet-stream one two]", ""},
    {"mime/message_between_its_parts.eml",
     "[cid:ahead text/plain; charset=utf-8 ahead of the message][cid:a%20b image/png; name=\"x.png\" pixels]",
     "?d==--"},
    {"mime/include.eml", "[cid:a%40b a/b beside][(null) (null) in place]", "--bb--"},
    {"mime/line_feeds_in_heads.eml", "[cid:a a/b; c=d line one\nline two]", "--bb--"},
    {"mime/encoded.eml", "[cid:b64 (null) cGl4ZWxz][cid:qp (null) caf=C3=A9]", "--bb--"},
};

TEST(samples, are_understood_however_they_arrive_and_wherever_they_are_cut)
{
    std::ptrdiff_t files = 0;
    for (const char *form : {"/dime", "/mime"})
        files += std::distance(std::filesystem::directory_iterator(std::string(ZUV_SAMPLE_DIR) + form), {});
    EXPECT_EQ(files, std::ssize(SAMPLES));
    for (const auto &[name, summary, last] : SAMPLES) {
        SCOPED_TRACE(name);
        const std::string bytes = sample(name);
        expect_same_at_every_split(bytes, summary);
        const std::size_t end = *last == '\0' ? bytes.size() : bytes.rfind(last) + std::strlen(last);
        expect_error_at_every_cut(bytes.substr(0, end - 1));
        expect_survival_of_every_change(bytes);
    }
}

TEST(samples, are_the_same_through_the_callbacks)
{
    for (const auto &[name, summary, last] : SAMPLES) {
        SCOPED_TRACE(name);
        reception in_memory(sample(name)), streamed(sample(name), 0, 3, 7);
        stream_host host;
        host.serve(*streamed.wire);
        ASSERT_EQ(in_memory.run(), 0);
        ASSERT_EQ(streamed.run(), 0);
        for (std::size_t i = 0; i < in_memory.values.size(); ++i) {
            const value &v = streamed.values[i];
            EXPECT_TRUE(v.id == nullptr ||
                        reinterpret_cast<host_stream *>(v.content)->data == in_memory.values[i].bytes());
        }
    }
}

// Each length of each record gives something else than what is there.
TEST(wrong_messages, of_records_with_false_lengths_are_refused)
{
    using namespace dime_bytes;
    const std::string records[] = {message_record(0, "<data href=\"a\"/><data href=\"b\"/>"),
                                   record(CF, MEDIA, "a", "t", "aaaa"), record(0, UNCHANGED, "", "", "AA"),
                                   record(ME, MEDIA, "b", "t", "bbbbbb")};
    const std::pair<std::size_t, int> fields[] = {{2, 2}, {4, 2}, {6, 2}, {8, 4}}; // place and width
    std::string bytes;
    for (const std::string &each : records)
        bytes += each;
    EXPECT_EQ(reception(bytes).summary(), "[a t aaaaAA][b t bbbbbb]");
    std::size_t start = 0;
    for (const std::string &each : records) {
        for (const auto &[at, width] : fields) {
            const std::uint32_t most = width == 2 ? 0xFFFF : 0xFFFFFFFF;
            std::uint32_t right = 0;
            for (std::size_t i = 0; i < static_cast<std::size_t>(width); ++i)
                right = right << 8 | static_cast<unsigned char>(each[at + i]);
            for (const std::uint32_t lie : {right - 1, right + 4, right + 8, most, most - 3}) {
                if (lie + 1 == right && (at == 6 || (at == 4 && start == 0)))
                    continue; // a type, or the message's id, one shorter: followed by what no one checks
                std::string changed = bytes;
                changed.replace(start + at, static_cast<std::size_t>(width), number(lie & most, width));
                EXPECT_EQ(reception(changed).summary().substr(0, 1), "!")
                    << "record at " << start << ", field at " << at << ": " << lie << " for " << right;
            }
        }
        start += each.size();
    }
}

std::string hex(const std::string &bytes)
{
    std::string text;
    for (const char c : bytes)
        text += {"0123456789abcdef"[static_cast<unsigned char>(c) >> 4], "0123456789abcdef"[c & 15]};
    return text;
}

// Prints for each message, an HTTP request in hexadecimal, its type, and the id, type and content of each part.
constexpr char TAKE_APART[] = R"(
import email, email.policy
for line in lines:
    head, _, body = bytes.fromhex(line).partition(b"\r\n\r\n")
    headers = head.partition(b"\r\n")[2]
    message = email.message_from_bytes(headers + b"\r\n\r\n" + body)
    assert not message.defects, message.defects
    assert message["Content-Length"] == str(len(body)), message["Content-Length"]
    parts = message.get_payload()
    assert parts[0]["Content-ID"] == message.get_param("start"), message["Content-Type"]
    found = [message.get_param("type")]
    for part in parts:
        assert not part.defects and part["Content-Transfer-Encoding"] == "binary"
        found.append(part.get_content_type() + " " + part["Content-ID"])
        if part is not parts[0]:
            found.append(part.get_payload(decode=True).hex())
    print("|".join(found))
)";

TEST(python_email, splits_what_is_sent)
{
    const std::string text = "line one\r\nline two";
    const std::string binary("\r\n--bb\0\xFF\r\n--=_zuv_\r", 19);
    const std::string nothing_special = "x";
    const std::string wanted =
        "a/b <a>|" + hex(text) + "|c/d <id2>|" + hex(binary) + "|e/f <x@y>|" + hex(nothing_special);
    std::vector<std::string> requests, expected;
    for (const char *start : {"<message@zuv_client_pro>", "<\"the \\message\"@x>"}) {
        memory_wire wire(0, MODE_MTOM | MODE_BUFFERED);
        if (requests.size() == 1) // the first is that of the library
            soap_mime_start(&wire, nullptr, start);
        ASSERT_EQ(send_request(wire, {make_value(text, "cid:a", "a/b"), make_value(binary, nullptr, "c/d"),
                                      make_value(nothing_special, "cid:x@y", "e/f")}),
                  0);
        requests.push_back(hex(wire.sent()));
        expected.push_back("application/xop+xml|application/xop+xml " + (start + ("|" + wanted)));
    }
    EXPECT_EQ(python_batch(TAKE_APART, requests), expected);
}

// Prints messages: their HTTP form in hexadecimal, and what has to be read. The parts come in every order,
// with and without start, preamble and epilogue, and with parameters that are hard to split.
constexpr char COMPOSE[] = R"(
import itertools
from email import policy
from email.mime.application import MIMEApplication
from email.mime.multipart import MIMEMultipart
from email.mime.nonmultipart import MIMENonMultipart
from email.encoders import encode_base64, encode_noop, encode_quopri
hrefs = ["cid:a%40b", "cid:b%20c", "q"]
parts = [MIMENonMultipart("text", "xml"),
         MIMEApplication(b"plain bytes, two\r\nlines", "x-plain", encode_noop),
         MIMEApplication(bytes(range(256)), "x-base64", encode_base64),
         MIMEApplication("caf\u00e9 = 1\r\n".encode(), "x-quoted", encode_quopri)]
parts[0].set_payload(
    '<SOAP-ENV:Envelope xmlns:SOAP-ENV="http://schemas.xmlsoap.org/soap/envelope/"><SOAP-ENV:Body>'
    + "".join('<data href="%s"/>' % h for h in hrefs) + "</SOAP-ENV:Body></SOAP-ENV:Envelope>")
for part, id in zip(parts, ['<the "root";x="y"@z>', "<a@b>", "<b c>", "<q>"]):
    part["Content-ID"] = id
def crlf(text):
    return "\r\n".join(text.replace("\r\n", "\n").split("\n"))
expected = "".join("[%s %s %s]" % (h, p["Content-Type"], crlf(p.get_payload())) for h, p in zip(hrefs, parts[1:]))
boundaries = itertools.cycle(["b", "===============1234567890==", "a b'()+_,-./:=? c", "x" * 70])
for order in itertools.permutations(parts):
    for ends in ((None, None), ("A preamble\r\n -- with dashes", "\r\nand an epilogue\r\n--b--")):
        for start in [{"start": parts[0]["Content-ID"]}] + [{}] * (order[0] is parts[0]):
            message = MIMEMultipart("related", next(boundaries), order, type='text/xml; a="b", boundary=none',
                                    **start)
            message.preamble, message.epilogue = ends
            sent = message.as_bytes(policy=policy.HTTP)
            print((b"HTTP/1.1 200 OK\r\n" + sent).hex() + " " + expected.encode().hex())
)";

TEST(python_email, is_read)
{
    const std::vector<std::string> composed = python_batch(COMPOSE, {});
    ASSERT_EQ(composed.size(), 24U * 2 + 6 * 2);
    for (const std::string &line : composed) {
        const std::string message = annotated_bytes(line.substr(0, line.find(' ')));
        const std::string expected = annotated_bytes(line.substr(line.find(' ') + 1));
        ASSERT_EQ(reception(message).summary(), expected) << message;
        ASSERT_EQ(reception(message, 0, 1, 1).summary(), expected) << message;
    }
}

} // namespace
