// everything_test.cpp - the classes that the generator makes of everything/, compiled, written and read back.
// Here: that generated lists and the rules fit together, for each form of member. Elsewhere: the text of the
// output (generator_test.cpp), the rules on the library's own classes (the tests of the binding).

#include <zuv_client_pro/all.h>

#include "contract_namespaces.h"
#include "support/reader_input.h"
#include "support/writer_fixture.h"

namespace {

constexpr char DOCUMENT[] =
    "<all:Everything xmlns:all=\"http://www.zuv.example/all\" "
    "xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\">"
    "<all:operator>a text</all:operator>"
    "<all:moment>2020-02-02T02:02:02Z</all:moment>"
    "<all:fix-pack>12.50</all:fix-pack>"
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
    "<all:remark colour=\"red\">well</all:remark><all:remark border=\"red\">plain</all:remark>"
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
    for (const std::string lacking :
         {"<all:title>a title</all:title>", "<all:piece><all:id>y</all:id></all:piece>"})
        for (const std::uint32_t mode : {0U, MODE_STRICT}) {
            std::string shorter = DOCUMENT;
            shorter.erase(shorter.find(lacking), lacking.size());
            reader_input::reception wire(shorter, SOAP_BUFFER_SIZE, SOAP_BUFFER_SIZE, mode);
            EXPECT_EQ(read(wire.context()) == nullptr, mode == MODE_STRICT) << lacking;
            EXPECT_EQ(wire->error, mode == MODE_STRICT ? SOAP_OCCURS : 0) << lacking;
        }
}
