// plugin.cpp - a plug-in of a host, with a copy of the library of its own inside: host_conditions_test loads and unloads it.
#include <memory>

#include "support/create_call.h"

#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_tls.h>

// The code of one call, -1 if the answer is another's. `own_init` takes where this copy of the library is.
extern "C" __attribute__((visibility("default"))) int plugin_call(const char *endpoint, const char *ca_file,
                                                                  const void **own_init)
{
    *own_init = reinterpret_cast<const void *>(&soap_context_init);
    const auto proxy = std::make_unique<ProfileSoapBindingProxy>();
    soap_log_set_received(proxy.get(), nullptr);
    soap_log_set_sent(proxy.get(), nullptr);
    proxy->endpoint = endpoint;
    if (const int code =
            soap_ssl_client_context(proxy.get(), TLS_VERIFY_PEER | TLS_NO_DEFAULT_CA | TLS_SKIP_HOST_CHECK,
                                    nullptr, nullptr, ca_file, nullptr, nullptr))
        return code;
    const created came = call_create(*proxy, "call-7", "plug-in");
    return came.code == 0 && !came.own ? -1 : came.code;
}
