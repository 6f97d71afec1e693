// traits_binary.h - the traits of xsd__base64Binary, the one class that is written by hand.
#pragma once

#include <zuv_client_pro/soap_binary.h>

#include "binding/traits.h"

namespace binding {

template <> struct traits<xsd__base64Binary> {
    using self = xsd__base64Binary;
    using base = void;
    static constexpr int type_id = 10;
    static constexpr char xml_type[] = "xsd:base64Binary";
    static constexpr bool global_element = false;
    static constexpr std::string self::*text = nullptr;
    static constexpr auto attributes = std::make_tuple();
    static constexpr auto elements = std::make_tuple();
    static const class_ops ops;
};

} // namespace binding
