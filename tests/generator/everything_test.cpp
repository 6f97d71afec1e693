// everything_test.cpp - the classes that the generator makes of everything/, compiled, written and read back.
//
// Here: that generated lists and the rules fit together, for each form of member. Elsewhere: the text of the
// output (generator_test.cpp), the rules on the library's own classes (the tests of the binding).
#include <gtest/gtest.h>

#include <zuv_client_pro/all.h>
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_error.h>

#include "contract_namespaces.h"
#include "support/reader_input.h"
#include "support/writer_fixture.h"

namespace {

constexpr char DOCUMENT[] =
    "<all:Everything xmlns:all=\"http://www.zuv.example/all\" "
    "xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\">"
    "<all:text>a text</all:text>"
    "<all:moment>2020-02-02T02:02:02Z</all:moment>"
    "<all:share>12.50</all:share>"
    "<all:flag>true</all:flag>"
    "<all:count>-7</all:count>"
    "<all:weight>1.5</all:weight>"
    "<all:colour>red.dark</all:colour>"
    "<all:bytes>AQID</all:bytes>"
    "<all:part xsi:type=\"all:Part.Spare\" "
    "colour=\"default\"><all:id>p</all:id><all:shelf>s</all:shelf></all:part>"
    "<all:title>a title</all:title>"
    "<all:size>small</all:size>"
    "<all:wanted>false</all:wanted>"
    "<all:retries>9</all:retries>"
    "<all:place><all:room>r</all:room></all:place>"
    "<all:line>one</all:line><all:line>two</all:line>"
    "<all:shade>default</all:shade><all:shade>red</all:shade>"
    "<all:piece><all:id>x</all:id></all:piece><all:piece><all:id>y</all:id></all:piece>"
    "<all:remark colour=\"red\">well</all:remark>"
    "</all:Everything>";

// The object's elements, without what the root declares.
std::string content_of(const all__Everything &object)
{
    writer_fixture::writer w;
    EXPECT_EQ(soap_set_namespaces(w.ctx.get(), soap_program_namespaces), 0);
    return writer_fixture::written(w, writer_fixture::start::inside, [&](soap *ctx) {
        EXPECT_EQ(object.soap_out(ctx, "all:Everything", -1, ""), 0);
    });
}

std::string content_of(const std::string &document)
{
    return document.substr(document.find('>') + 1);
}

all__Everything *read(soap *ctx)
{
    ctx->namespaces = soap_program_namespaces;
    EXPECT_EQ(soap_set_namespaces(ctx, soap_program_namespaces), 0);
    all__Everything *object = soap_instantiate_all__Everything(ctx, -1, nullptr, nullptr, nullptr);
    return static_cast<all__Everything *>(object->soap_in(ctx, "all:Everything", nullptr));
}

} // namespace

TEST(everything, is_the_same_after_reading_and_writing)
{
    const std::string again = reader_input::every_reading(DOCUMENT, 0, [](soap *ctx) {
        const all__Everything *object = read(ctx);
        return object ? content_of(*object) : "error " + std::to_string(ctx->error);
    });
    EXPECT_EQ(content_of(again), content_of(DOCUMENT));
}

TEST(everything, is_held_as_declared)
{
    reader_input::reception wire(DOCUMENT);
    const all__Everything *object = read(wire.context());
    ASSERT_NE(object, nullptr);
    EXPECT_EQ(*object->moment, "2020-02-02T02:02:02Z");
    EXPECT_EQ(*object->count, -7);
    EXPECT_EQ(*object->colour, all__Colour::red_x002edark);
    ASSERT_EQ(object->bytes->size, 3);
    EXPECT_EQ(object->bytes->content[2], 3);
    EXPECT_EQ(object->size, all__Everything_size::small);
    EXPECT_EQ(object->shade, (std::vector<all__Colour>{all__Colour::default_, all__Colour::red}));
    EXPECT_EQ(object->remark.at(0)->value, "well");
    EXPECT_EQ(*object->remark.at(0)->colour, all__Colour::red);
    const auto *spare = dynamic_cast<const all__Part_x002eSpare *>(object->part);
    ASSERT_NE(spare, nullptr);
    EXPECT_EQ(spare->soap_type(), SOAP_TYPE_all__Part_x002eSpare);
    EXPECT_EQ(spare->colour, all__Colour::default_);
    EXPECT_EQ(spare->soap, wire.context());
}

TEST(everything, starts_at_its_defaults)
{
    const all__Everything made;
    EXPECT_EQ(made.soap, nullptr);
    EXPECT_EQ(content_of(content_of(made)),
              "<all:part xsi:nil=\"true\"/><all:title></all:title><all:size>large</all:size>"
              "<all:wanted>true</all:wanted><all:retries>3</all:retries></all:Everything>");
}

TEST(everything, asks_in_strict_mode_for_what_is_required)
{
    const std::string document = DOCUMENT;
    for (const char *lacking :
         {"<all:title>a title</all:title>", "<all:piece><all:id>y</all:id></all:piece>"}) {
        std::string shorter = document;
        shorter.erase(shorter.find(lacking), std::string(lacking).size());
        reader_input::reception lenient(shorter);
        EXPECT_NE(read(lenient.context()), nullptr) << lacking;
        reader_input::reception strict(shorter, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, MODE_STRICT);
        EXPECT_EQ(read(strict.context()), nullptr) << lacking;
        EXPECT_EQ(strict.context()->error, SOAP_OCCURS) << lacking;
    }
}
