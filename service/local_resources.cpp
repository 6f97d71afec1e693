// local_resources.cpp - see local_resources.h.
#include "local_resources.h"

#include <charconv>

#include <openssl/evp.h>
#include <strings.h>

#include "contract_files.h"
#include "front_page_text.h" // made of front_page.html by cmake/service.cmake

namespace service {

namespace {

constexpr std::string_view LINKS = "<!-- links -->";

// The text between a tag and its end tag.
std::string_view content_of(std::string_view tag, std::string_view end_tag)
{
    const std::size_t begin = FRONT_PAGE.find(tag) + tag.size();
    return FRONT_PAGE.substr(begin, FRONT_PAGE.find(end_tag, begin) - begin);
}

std::string hash_source(std::string_view text)
{
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned char encoded[2 * EVP_MAX_MD_SIZE];
    std::size_t length = 0;
    if (EVP_Q_digest(nullptr, "SHA256", nullptr, text.data(), text.size(), digest, &length) != 1)
        return "'none'";
    const int characters = EVP_EncodeBlock(encoded, digest, static_cast<int>(length));
    return "'sha256-" + std::string(encoded, encoded + characters) + "'";
}

} // namespace

std::string front_page(const request_target &target)
{
    std::string page(FRONT_PAGE);
    return page.replace(page.find(LINKS), LINKS.size(), contract_links(target));
}

const char *page_policy()
{
    static const std::string policy = "default-src 'none'; connect-src 'self'; base-uri 'none'; form-action "
                                      "'none'; frame-ancestors 'none'; "
                                      "script-src " +
                                      hash_source(content_of("<script>", "</script>")) + "; style-src " +
                                      hash_source(content_of("<style>", "</style>"));
    return policy.c_str();
}

std::uint64_t number_after(const request_target &target)
{
    constexpr std::string_view NAME = "after=";
    std::uint64_t number = 0;
    const std::string &query = target.query;
    if (query.starts_with(NAME))
        std::from_chars(query.data() + NAME.size(), query.data() + query.size(), number);
    return number;
}

bool is_json(const char *type)
{
    const std::string_view given = type == nullptr ? "" : type;
    const std::string media(given.substr(0, given.find_first_of("; \t")));
    return strcasecmp(media.c_str(), JSON_TYPE) == 0;
}

} // namespace service
