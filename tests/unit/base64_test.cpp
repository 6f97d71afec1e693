// base64_test.cpp - base64 and hexadecimal: whole texts, content of a message, both compared with Python.
#include "support/memory_wire.h"
#include "support/python_batch.h"

namespace {

const unsigned char *bytes_of(const std::string &text)
{
    return reinterpret_cast<const unsigned char *>(text.data());
}

std::string random_bytes(std::mt19937 &random, std::size_t count)
{
    std::string bytes(count, '\0');
    for (char &byte : bytes)
        byte = static_cast<char>(random());
    return bytes;
}

class base64 : public testing::Test {
protected:
    memory_wire ctx;

    // Decoded bytes in brackets, or "refused".
    std::string decoded(const char *text, char *target = nullptr, std::size_t capacity = 0)
    {
        int length = -1;
        ctx.error = 0;
        const char *bytes = soap_base642s(&ctx, text, target, capacity, &length);
        if (bytes == nullptr) {
            EXPECT_EQ(ctx.error, SOAP_TYPE_MISMATCH);
            return "refused";
        }
        return "[" + std::string(bytes, static_cast<std::size_t>(length)) + "]";
    }

    // Reads the content of an element that holds `text`, with the input cut into pieces of that size.
    std::string read_inline(unsigned char *(*read)(soap *, int *), const std::string &text, std::size_t piece)
    {
        soap_reset_call(&ctx);
        ctx.buffer_index = ctx.buffer_length = 0;
        ctx.has_body = 0;
        ctx.in_cdata = 0;
        ctx.piece = [piece](std::size_t) { return piece; };
        ctx.receive("<d>" + text + "</d><next/>");
        int length = -1;
        EXPECT_EQ(soap_element_in_begin(&ctx, "d", 0, nullptr), 0);
        const unsigned char *bytes = read(&ctx, &length);
        if (bytes == nullptr) {
            EXPECT_EQ(ctx.error, SOAP_TYPE_MISMATCH) << text;
            return "refused";
        }
        EXPECT_EQ(bytes[length], 0);
        EXPECT_EQ(soap_element_in_end(&ctx, "d"), 0) << text;
        EXPECT_EQ(soap_element_in_begin(&ctx, "next", 0, nullptr), 0) << "reading goes on after the element";
        return "[" + std::string(reinterpret_cast<const char *>(bytes), static_cast<std::size_t>(length)) +
               "]";
    }
};

TEST_F(base64, whole_texts_are_decoded_up_to_padding)
{
    const std::tuple<const char *, const char *, const char *> cases[] = {
        {"one byte left over", "Zg==", "[f]"},
        {"padding may lack", "Zm9vYg", "[foob]"},
        {"a lone digit carries nothing", "Zm9vY", "[foo]"},
        {"white space anywhere", " Zm9\r\nvY\tmF y\n", "[foobar]"},
        {"nothing counts after padding", "Zg==!!", "[f]"},
        {"the other alphabet", "Zm9-", "refused"},
        {"a high byte", "Zm9v\xc3", "refused"},
    };
    for (const auto &[rule, text, bytes] : cases)
        EXPECT_EQ(decoded(text), bytes) << rule;
    EXPECT_EQ(decoded(nullptr), "[]");
    int length = -1;
    ctx.error = SOAP_FAULT;
    EXPECT_EQ(soap_base642s(&ctx, nullptr, nullptr, 0, &length), nullptr)
        << "an error that stands is not covered up";
    EXPECT_EQ(length, 0);
}

TEST_F(base64, a_target_is_filled_and_not_overrun)
{
    char target[8];
    for (std::size_t capacity = 0; capacity <= 7; capacity++) {
        std::memset(target, '#', sizeof target);
        const std::string whole = "foobar";
        EXPECT_EQ(decoded("Zm9vYmFy", target, capacity), "[" + whole.substr(0, capacity) + "]");
        EXPECT_EQ(target[capacity], '#') << "capacity " << capacity;
        EXPECT_TRUE(capacity < 7 || target[6] == '\0') << "a terminator where space is left";
    }
    EXPECT_EQ(decoded("Zm9vYmFy!", target, 3), "[foo]") << "what doesn't fit is not looked at";
}

TEST_F(base64, bytes_are_encoded_into_a_target_or_none)
{
    char target[9];
    EXPECT_EQ(soap_s2base64(&ctx, bytes_of("foobar"), target, 6), target);
    EXPECT_STREQ(target, "Zm9vYmFy");
    EXPECT_STREQ(soap_s2base64(&ctx, nullptr, nullptr, 5), "");
    EXPECT_STREQ(soap_s2base64(&ctx, bytes_of("x"), nullptr, -1), "");
}

TEST_F(base64, content_of_a_message_reads_the_same_at_every_cut)
{
    using reader = unsigned char *(*)(soap *, int *);
    const std::tuple<const char *, const char *, const char *, reader> cases[] = {
        {"broken into lines", "Zm9v\r\n YmFy\n", "[foobar]", soap_base64_inline_read},
        {"line breaks as references", "Zm9v&#xD;&#10;YmFy", "[foobar]", soap_base64_inline_read},
        {"a digit as a reference", "Zm9vYmF&#121;", "[foobar]", soap_base64_inline_read},
        {"in a section", "<![CDATA[Zm9v]]>YmFy", "[foobar]", soap_base64_inline_read},
        {"around a comment", "Zm9v<!-- x -->YmFy", "[foobar]", soap_base64_inline_read},
        {"the rest after padding is dropped", "Zm8=Zm9v!", "[fo]", soap_base64_inline_read},
        {"up to a child", "Zm9v<child>Zm9v</child>", "[foo]", soap_base64_inline_read},
        {"up to a mark", "Zm9v>Zm9v", "[foo]", soap_base64_inline_read},
        {"empty", "", "[]", soap_base64_inline_read},
        {"not in the alphabet", "Zm9v-", "refused", soap_base64_inline_read},
        {"both cases", "666f6F", "[foo]", soap_hex_inline_read},
        {"blanks before", " \n66", "[f]", soap_hex_inline_read},
        {"up to a blank", "66 6f", "[f]", soap_hex_inline_read},
        {"a lone digit", "666", "refused", soap_hex_inline_read},
        {"a lone digit and more", "6g", "refused", soap_hex_inline_read},
        {"no digit", "xyz", "[]", soap_hex_inline_read},
        {"no hexadecimal digits", "", "[]", soap_hex_inline_read},
    };
    for (const auto &[rule, text, bytes, read] : cases)
        for (std::size_t piece = 1; piece < 30; piece++)
            EXPECT_EQ(read_inline(read, text, piece), bytes) << rule << ", " << piece;
    ctx.has_body = 0;
    int length = -1;
    EXPECT_NE(soap_base64_inline_read(&ctx, &length), nullptr);
    EXPECT_EQ(length, 0) << "an empty element has no content to read";
}

TEST_F(base64, hex_texts_are_taken_on_trust)
{
    int length = -1;
    EXPECT_STREQ(soap_hex_decode(&ctx, "666F6f7", nullptr, 0, &length), "foo");
    EXPECT_EQ(length, 3);
    char target[3] = {'#', '#', '#'};
    EXPECT_EQ(soap_hex_decode(&ctx, "666f6f", target, 2, &length), target);
    EXPECT_EQ(length, 2);
    EXPECT_EQ(std::string(target, 3), "fo#");
    EXPECT_STREQ(soap_hex_encode(&ctx, bytes_of("\xaf\x01"), nullptr, 2), "af01");
}

TEST_F(base64, random_bytes_agree_with_python)
{
    std::mt19937 random(1);
    std::vector<std::string> inputs, hex;
    for (std::size_t i = 0; i < 300; i++) {
        inputs.push_back(random_bytes(random, i < 60 ? i : random() % 5000));
        hex.emplace_back(
            soap_hex_encode(&ctx, bytes_of(inputs[i]), nullptr, static_cast<int>(inputs[i].size())));
    }
    const std::vector<std::string> answers = python_batch(
        "import base64\nfor t in lines: print(base64.b64encode(bytes.fromhex(t)).decode())\n", hex);
    ASSERT_EQ(answers.size(), inputs.size());
    ctx.mode = 0;
    for (std::size_t i = 0; i < inputs.size(); i++) {
        const auto length = static_cast<int>(inputs[i].size());
        ASSERT_EQ(soap_s2base64(&ctx, bytes_of(inputs[i]), nullptr, length), answers[i]);
        ASSERT_EQ(decoded(answers[i].c_str()), "[" + inputs[i] + "]");
        ASSERT_EQ(read_inline(soap_base64_inline_read, answers[i], 1 + random() % 700),
                  "[" + inputs[i] + "]");
        ctx.sends.clear();
        ctx.mode = MODE_DIRECT;
        ASSERT_EQ(soap_base64_write(&ctx, bytes_of(inputs[i]), inputs[i].size()), 0);
        ASSERT_EQ(ctx.sent(), answers[i]);
    }
}

TEST_F(base64, writing_stops_at_the_first_error)
{
    ctx.send_limit = 1;
    const std::string bytes(5000, 'x');
    EXPECT_NE(soap_base64_write(&ctx, bytes_of(bytes), bytes.size()), 0);
    EXPECT_EQ(ctx.sends.size(), 1U);
    ctx.sends.clear();
    ctx.error = 0;
    EXPECT_EQ(soap_hex_write(&ctx, bytes_of("\xaf\x01"), 2), 0);
    EXPECT_EQ(ctx.sent(), "AF01");
    EXPECT_NE(soap_hex_write(&ctx, bytes_of(bytes), bytes.size()), 0);
    ctx.error = 0;
    EXPECT_STREQ(soap_hex_decode(&ctx, nullptr, nullptr, 0, nullptr), "");
    EXPECT_STREQ(soap_hex_decode(&ctx, "4a4B4", nullptr, 0, nullptr), "JK");
}

} // namespace
