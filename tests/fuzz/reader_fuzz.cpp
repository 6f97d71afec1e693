// reader_fuzz.cpp - XML into objects of every class that an element's name or type can call up, without HTTP. The
// first byte chooses mode and cuts, the rest is the document. Two ways must agree: read whole, and read in pieces.

#include "contract_namespaces.h"
#include "support/memory_wire.h"

namespace {

struct outcome {
    int error, type;
    bool read;
};

outcome read_document(const std::string &document, std::uint32_t mode, std::size_t piece)
{
    memory_wire wire(mode | MODE_BARE_XML, mode);
    soap_set_namespaces(&wire, soap_program_namespaces);
    wire.receive(document, piece, piece);
    outcome result{0, 0, false};
    soap_reset_call(&wire);
    if (soap_receive_begin(&wire) == 0) {
        wire.soap_version = 1;
        result.read = soap_read_element(&wire, &result.type) != nullptr;
        if (result.read)
            soap_receive_finish(&wire);
    }
    result.error = wire.error;
    // How much of a broken compressed stream came at once settles what is noticed first. That it fails shows
    // either way.
    if (result.error == SOAP_ZLIB_ERROR || (result.error != 0 && (wire.mode & MODE_DEFLATE) != 0))
        return {SOAP_ZLIB_ERROR, 0, false};
    return result;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    if (size < 2)
        return 0;
    static const std::uint32_t modes[] = {0,
                                          MODE_STRICT,
                                          MODE_UTF_STRINGS,
                                          MODE_LATIN1,
                                          SOAP_XML_GRAPH,
                                          SOAP_XML_TREE,
                                          MODE_IGNORE_NAMESPACES,
                                          MODE_STRICT | MODE_UTF_STRINGS};
    const std::string document(reinterpret_cast<const char *>(data + 1), size - 1);
    const std::uint32_t mode = modes[data[0] & 7];
    const outcome whole = read_document(document, mode, SOAP_BUFFER_SIZE);
    const outcome pieces = read_document(document, mode, 1U + (data[0] >> 3));
    if (whole.error != pieces.error || whole.type != pieces.type || whole.read != pieces.read)
        std::abort();
    return 0;
}
