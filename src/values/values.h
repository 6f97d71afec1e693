// values.h - what the readers of values share: the check of a simple element's xsi:type, and qualified names.
#pragma once

#include <zuv_client_pro/soap.h>

// True if the held xsi:type is one of XML Schema itself or of the SOAP encoding. Peers that type every value
// by what it is to them, a word being a string and a small number an int, say no more by it than the text
// does.
bool type_says_nothing(soap *ctx);

// 0 if the held xsi:type is absent, is `type` (null: any), or is one of the list `also` (null for none),
// which ends with null. Otherwise the start tag is given back: -1, SOAP_TYPE_MISMATCH.
int type_accept(soap *ctx, const char *type, const char *const *also);

// As soap_qname_read_map without bounds, but the text is UTF-8 whatever the strings of the mode are.
int xml_qname_map_utf8(soap *ctx, const char *text, char **target);
