// response_fuzz.cpp - a response from the first byte of its HTTP head to the typed objects. The first byte of
// the input chooses the mode and how the rest is cut into receives; the rest is what the peer sends. The
// answer that was read is written again in every framing: the two passes must agree on its length.

#include "support/call_wire.h"

namespace {

std::string content_length_of(const std::string &sent)
{
    const std::size_t at = sent.find("Content-Length: ");
    return at == std::string::npos ? "" : sent.substr(at + 16, sent.find('\r', at) - at - 16);
}

void write_back(ProfileSoapBindingProxy &proxy, call_wire &wire, protocolProfile__ProfileContent *document)
{
    wire.sent.clear();
    proxy.output_mode = MODE_BUFFERED;
    wire.answers.clear(); // the peer closes: the call fails once everything was sent
    __protocolProfile__setResponse response;
    proxy._set("http://h/", nullptr, document, response);
    if (wire.sent.empty())
        return;
    const std::size_t body = wire.sent.size() - wire.sent.find("\r\n\r\n") - 4;
    if (content_length_of(wire.sent) != std::to_string(body))
        std::abort();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    if (size == 0)
        return 0;
    static const std::uint32_t modes[] = {0,
                                          MODE_STRICT,
                                          MODE_KEEP_ALIVE,
                                          MODE_UTF_STRINGS,
                                          SOAP_XML_GRAPH,
                                          SOAP_XML_TREE,
                                          MODE_IGNORE_NAMESPACES,
                                          MODE_STRICT | MODE_UTF_STRINGS};
    static const std::size_t pieces[] = {SOAP_BUFFER_SIZE, 1, 2, 5, 17, 100, 1000, 4096};
    call_wire wire;
    ProfileSoapBindingProxy proxy("http://h/", static_cast<int>(modes[data[0] & 7]));
    wire.carry(proxy);
    wire.piece = pieces[data[0] >> 3 & 7];
    wire.answers.emplace_back(reinterpret_cast<const char *>(data + 1), size - 1);
    if (wire.answers.back().empty())
        wire.answers.clear();
    _protocolProfile__getRequest request;
    __protocolProfile__getResponse response;
    if (proxy.get(&request, response) == 0)
        write_back(proxy, wire, response.result);
    return 0;
}
