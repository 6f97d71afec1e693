// library.h - the library's public headers, what of the standard library most tests work with, and small
// texts. Elsewhere: the classes of the service (their own headers), GoogleTest (testing.h).
#pragma once

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <deque>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <tuple>
#include <utility>
#include <vector>

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_binary.h>
#include <zuv_client_pro/soap_call.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_http.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_log.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_plugin.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_tcp.h>
#include <zuv_client_pro/soap_tls.h>
#include <zuv_client_pro/soap_xml.h>

// A text that may be null, for comparisons.
inline std::string text_of(const char *text)
{
    return text != nullptr ? text : "(null)";
}

// Data as one chunk of a chunked body, and a body in chunks of a size, with the last one.
inline std::string chunk(const std::string &data)
{
    char size[32];
    std::snprintf(size, sizeof size, "%zX\r\n", data.size());
    return size + data + "\r\n";
}

inline std::string in_chunks_of(std::size_t size, const std::string &body)
{
    std::string chunks;
    for (std::size_t at = 0; at < body.size(); at += size)
        chunks += chunk(body.substr(at, size));
    return chunks + "0\r\n\r\n";
}

inline std::string file_content(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// Seconds that this thread has computed: what a busy machine doesn't change.
inline double cpu_time()
{
    std::timespec now{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

// The parts of a text between its blanks.
inline std::vector<std::string> words(const std::string &text)
{
    std::istringstream all(text);
    return {std::istream_iterator<std::string>(all), {}};
}

inline std::string repeat_text(const std::string &text, std::size_t times)
{
    std::string all;
    for (std::size_t i = 0; i < times; ++i)
        all += text;
    return all;
}
