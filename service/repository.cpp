// repository.cpp - see repository.h.
#include "repository.h"

namespace service {

std::string target_of(const call &c, const std::vector<std::string> *own_names)
{
    if (c.header != nullptr) {
        if (!text_of(c.header->targetURI).empty())
            return *c.header->targetURI;
        const protocol__CompoundTargetURI *const compound = c.header->compoundTargetURI;
        if (compound != nullptr && !text_of(compound->uri).empty())
            return *compound->uri;
    }
    if (own_names != nullptr && !own_names->empty() && !own_names->front().empty())
        return own_names->front();
    refuse<protocol__Client_x002eInsufficientInformation>(
        c.ctx, "The request does not name its document: the header's targetURI is missing.");
}

} // namespace service
