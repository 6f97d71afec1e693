// error_test.cpp - texts of error codes, faults made from them, and their printed forms.
#include "support/testing.h"

namespace {

std::string printed_to_buffer(soap *ctx)
{
    char buffer[2048] = "";
    soap_fault_print_text(ctx, buffer, sizeof buffer);
    return buffer;
}

std::string printed_to_stream(soap *ctx)
{
    std::ostringstream stream;
    EXPECT_EQ(&soap_fault_print_stream(ctx, stream), &stream);
    return stream.str();
}

template <class Print> std::string written(Print print)
{
    std::FILE *file = std::tmpfile();
    print(file);
    std::string text(static_cast<std::size_t>(std::ftell(file)), '\0');
    std::rewind(file);
    EXPECT_EQ(std::fread(text.data(), 1, text.size(), file), text.size());
    std::fclose(file);
    return text;
}

std::string printed_to_file(soap *ctx)
{
    return written([ctx](std::FILE *file) { soap_fault_print_file(ctx, file); });
}

// What all forms print, unless they differ.
std::string printed(soap *ctx)
{
    const std::string text = printed_to_buffer(ctx);
    EXPECT_EQ(printed_to_stream(ctx), text);
    EXPECT_EQ(printed_to_file(ctx), text);
    return text;
}

std::string filled_text(int error)
{
    soap ctx;
    std::strcpy(ctx.tag, "t:tag");
    std::strcpy(ctx.element_type, "xsd:int");
    std::strcpy(ctx.element_id, "#id7");
    ctx.error = error;
    soap_fault_text_fill(&ctx);
    return *soap_fault_string_field(&ctx);
}

TEST(error_text, is_composed_of_what_is_known)
{
    static const std::pair<int, const char *> cases[] = {
        {-1, "End of file or no input: Operation interrupted or timed out"},
        {0, "Error 0"},
        {3, "Validation constraint violation: tag name or namespace mismatch in element 't:tag'"},
        {4, "Validation constraint violation: data type mismatch xsd:int in element 't:tag'"},
        {13, "Method 't:tag' not implemented: method name or namespace not recognized"},
        {23, "Validation constraint violation: nil not allowed in element 't:tag'"},
        {24,
         "Validation constraint violation: multiple definitions (use the SOAP_XML_TREE flag) of the same id "
         "#id7 in element 't:tag'"},
        {25, "Validation constraint violation: missing id for ref #id7 in element 't:tag'"},
        {26, "Validation constraint violation: incompatible object type ref/id pair #id7 in element 't:tag'"},
        {31, "Zlib/gzip error: ''"},
        {200, "HTTP status 200, but the answer is not a SOAP message"},
        {404, "HTTP Error: 404 Not Found"},
        {599, "HTTP Error: 599 "},
        {600, "Error 600"},
        {1001, "Error 1001"},
    };
    for (const auto &[error, text] : cases)
        EXPECT_EQ(filled_text(error), text) << error;
}

TEST(error_text, every_code_has_a_text_of_its_own)
{
    std::set<std::string> texts;
    for (int error = 1; error <= 48; ++error) {
        if (error == SOAP_FAULT)
            continue; // has the text of its fault
        const std::string text = filled_text(error);
        EXPECT_EQ(text == "Error " + std::to_string(error), error == 17 || error == 18) << text;
        EXPECT_TRUE(texts.insert(text).second) << text;
    }
}

TEST(error_text, constraint_text_names_the_element_if_there_is_one)
{
    soap ctx;
    EXPECT_STREQ(soap_constraint_text(&ctx, "wrong ", "value"),
                 "Validation constraint violation: wrong value");
    EXPECT_STREQ(soap_constraint_text(&ctx, "wrong", nullptr), "Validation constraint violation: wrong");
    std::memset(ctx.tag, 'x', sizeof ctx.tag - 1);
    EXPECT_EQ(std::strlen(soap_constraint_text(&ctx, "wrong", nullptr)), SOAP_TEXT_SIZE - 1)
        << "cut to the buffer";
}

TEST(fault, the_code_follows_the_version_unless_the_error_has_its_own)
{
    static const std::tuple<int, std::int16_t, const char *, const char *> cases[] = {
        {5, 1, "SOAP-ENV:Client", nullptr},
        {5, 2, "SOAP-ENV:Sender", nullptr},
        {12, 1, "SOAP-ENV:Client", nullptr},
        {8, 1, "SOAP-ENV:MustUnderstand", nullptr},
        {39, 2, "SOAP-ENV:VersionMismatch", nullptr},
        {41, 2, "SOAP-ENV:DataEncodingUnknown", nullptr},
        {24, 2, "SOAP-ENV:Sender", "SOAP-ENC:DuplicateID"},
        {25, 2, "SOAP-ENV:Sender", "SOAP-ENC:MissingID"},
        {25, 1, "SOAP-ENV:Client", nullptr},
    };
    for (const auto &[error, version, code, subcode] : cases) {
        SCOPED_TRACE(error);
        soap ctx;
        ctx.soap_version = version;
        ctx.error = error;
        soap_fault_text_fill(&ctx);
        EXPECT_STREQ(*soap_fault_code_field(&ctx), code);
        EXPECT_STREQ(soap_fault_subcode_value(&ctx), subcode);
    }
}

TEST(fault, what_is_set_stays_and_the_hook_comes_first)
{
    soap ctx;
    EXPECT_EQ(soap_fault_receiver(&ctx, "own text", "own detail", 5), 5);
    soap_fault_text_fill(&ctx);
    EXPECT_EQ(printed(&ctx),
              "Error 5 fault: SOAP-ENV:Server [no subcode]\n\"own text\"\nDetail: own detail\n");
    soap hooked;
    hooked.error = SOAP_MUST_UNDERSTAND;
    hooked.on_error_text = [](soap *, const char **code, const char **text) {
        *code = "x:Code";
        *text = "from the hook";
    };
    soap_fault_text_fill(&hooked);
    EXPECT_STREQ(*soap_fault_code_field(&hooked), "x:Code");
    EXPECT_STREQ(*soap_fault_string_field(&hooked), "from the hook");
}

TEST(fault, setters_store_what_is_given)
{
    soap ctx;
    ctx.soap_version = 2;
    std::string text = "text", detail = "<d/>", subcode = "x:sub";
    EXPECT_EQ(soap_fault_sender_copied(&ctx, subcode.c_str(), text.c_str(), detail.c_str()), SOAP_FAULT);
    text = detail = subcode = "gone";
    EXPECT_EQ(printed_to_buffer(&ctx), "SOAP 1.2 fault: SOAP-ENV:Sender [x:sub]\n\"text\"\nDetail: <d/>\n");
    EXPECT_EQ(soap_fault_sender(&ctx, "t", "", 29), 29);
    EXPECT_EQ(soap_fault_receiver_copied(&ctx, nullptr, "last", nullptr), 12);
    EXPECT_EQ(printed_to_buffer(&ctx), "SOAP 1.2 fault: SOAP-ENV:Receiver [x:sub]\n\"last\"\nDetail: <d/>\n");
    EXPECT_EQ(ctx.error, SOAP_FAULT);
}

TEST(fault, the_three_print_forms_agree)
{
    soap ctx;
    EXPECT_EQ(printed(&ctx), "") << "error 0";
    EXPECT_EQ(ctx.fault, nullptr);
    ctx.soap_version = 1;
    ctx.error = SOAP_FAULT;
    EXPECT_EQ(printed(&ctx),
              "SOAP 1.1 fault: SOAP-ENV:Client [no subcode]\n\"[no reason]\"\nDetail: [no detail]\n");
}

TEST(fault, the_buffer_form_keeps_to_its_length)
{
    soap ctx;
    ctx.error = SOAP_SYNTAX_ERROR;
    const std::string whole = printed_to_buffer(&ctx);
    for (std::size_t length = 0; length < 40; ++length) {
        char buffer[48];
        std::memset(buffer, '#', sizeof buffer);
        EXPECT_EQ(soap_fault_print_text(&ctx, buffer, length), buffer);
        if (length > 0) {
            EXPECT_EQ(std::string(buffer), whole.substr(0, length - 1));
        }
        EXPECT_EQ(buffer[length], '#') << length;
    }
}

TEST(fault, a_context_that_has_ended_says_so)
{
    soap ended;
    soap_engine_done(&ended);
    for (soap *ctx : {static_cast<soap *>(nullptr), &ended}) {
        EXPECT_EQ(printed_to_buffer(ctx), "Error: soap struct not initialized");
        EXPECT_EQ(printed_to_stream(ctx), "Error: soap struct state not initialized\n");
        EXPECT_EQ(printed_to_file(ctx), "Error: soap struct state not initialized\n");
    }
}

std::string location(soap *ctx, std::size_t position, const std::string &input)
{
    ctx->buffer_index = position;
    ctx->buffer_length = input.size();
    std::memcpy(ctx->buffer, input.data(), input.size());
    const std::string printed = written([ctx](std::FILE *file) { soap_fault_location_print(ctx, file); });
    EXPECT_EQ(std::string(ctx->buffer, input.size()), input) << "the input is as it was";
    return printed;
}

TEST(fault_location, shows_the_input_around_the_place)
{
    soap ctx;
    EXPECT_EQ(location(&ctx, 3, "<a>bc"), "") << "error 0";
    ctx.error = SOAP_STOP;
    EXPECT_EQ(location(&ctx, 3, "<a>bc"), "");
    ctx.error = SOAP_SYNTAX_ERROR;
    EXPECT_EQ(location(&ctx, 3, "<a>bc"), "<a>\n<!-- ** HERE ** -->\nb\n") << "the last byte is cut";
    EXPECT_EQ(location(&ctx, 5, "<a>bc"), "<a>bc\n<!-- ** HERE ** -->\n");
    EXPECT_EQ(location(&ctx, 0, "<a>bc"), "<\n<!-- ** HERE ** -->\n<a>b\n");
    EXPECT_EQ(location(&ctx, 1, "<"), "<\n<!-- ** HERE ** -->\n");
    EXPECT_EQ(location(&ctx, 6, "<a>bc"), "");
    EXPECT_EQ(location(&ctx, 0, ""), "");
    const std::string full(SOAP_BUFFER_SIZE, 'x');
    EXPECT_EQ(location(&ctx, 1, full), "x\n<!-- ** HERE ** -->\n" + std::string(1022, 'x') + "\n");
}

TEST(fault, without_memory_a_fault_is_still_printed)
{
    soap ctx;
    ctx.error = SOAP_SYNTAX_ERROR;
    char buffer[200];
    {
        const failing_malloc::scope armed(1, failing_malloc::refuse::all_from);
        soap_fault_print_text(&ctx, buffer, sizeof buffer);
        EXPECT_EQ(soap_fault_sender_copied(&ctx, "a", "b", "c"), SOAP_OUT_OF_MEMORY);
    }
    EXPECT_THAT(buffer, HasSubstr(" fault: SOAP-ENV:Client [no subcode]\n"));
}

} // namespace
