// parsed.h - an object of the contract from XML: shorter than to fill one by hand.
#pragma once

#include <string>

#include <zuv_client_pro/soap_xml.h>

#include "document.h"

// The element, such as "protocolUpdateOrder:Filter", around a content in which the contract's prefixes are
// known.
template <class T> class parsed {
public:
    parsed(const std::string &element, const std::string &content)
    {
        std::string xml = "<" + element;
        for (const soap_namespace *row = soap_program_namespaces; row->prefix != nullptr; ++row)
            xml += std::string(" xmlns:") + row->prefix + "=\"" + row->uri + "\"";
        object_ = codec_.read<T>(xml + ">" + content + "</" + element + ">");
    }
    const T &operator*() const { return *object_; }

private:
    service::document_codec codec_{1 << 20, 200};
    T *object_;
};
