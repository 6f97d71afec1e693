// endpoints.cpp - see endpoints.h.
#include "endpoints.h"

#include "connection.h"
#include "failure.h"
#include "text_files.h"

namespace cli {

std::string full_address(const std::string &address, const port &of)
{
    refuse_user(address);
    const std::size_t scheme = address.find("://");
    if ((!address.starts_with("http://") && !address.starts_with("https://")) ||
        address.find_first_of(" \t\r\n") != std::string::npos)
        throw failure(EXIT_USAGE, "--endpoint: http://HOST:PORT or https://HOST:PORT is wanted, not \"" +
                                      printable(address) + "\"");
    const std::size_t slash = address.find('/', scheme + 3);
    if (slash != std::string::npos && slash + 1 < address.size())
        return address;
    return address.substr(0, slash) + of.path;
}

std::string call_addresses(const std::vector<std::string> &given, const port &of)
{
    if (given.empty() && of.default_address == nullptr)
        throw failure(EXIT_USAGE, std::string("the port ") + of.name +
                                      " has no usual address: give one by --endpoint or ZUV_ENDPOINT");
    std::string all;
    for (const std::string &one : given)
        all += (all.empty() ? "" : " ") + full_address(one, of);
    return given.empty() ? of.default_address : all;
}

} // namespace cli
