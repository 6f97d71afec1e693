// Python's email package at the other end: it splits what the library sends, and composes what the library reads.
#include "support/annotated_bytes.h"
#include "support/attachment_exchange.h"
#include "support/python_batch.h"

using namespace attachment_exchange;

namespace {

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
