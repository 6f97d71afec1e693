// scratch.cpp - see scratch.h.
#include "core/scratch.h"

#include <zuv_client_pro/soap_xml.h>

void soap_prefix_list_free(soap *ctx)
{
    const std::uint32_t level = ctx->nesting_level;
    ctx->nesting_level = 0; // a pop takes the current depth and all deeper ones
    soap_prefix_pop(ctx);
    ctx->nesting_level = level;
}

void soap_element_state_reset(soap *ctx)
{
    ctx->in_cdata = 0;
    ctx->has_body = 0;
    ctx->position_count = 0;
    ctx->encoding_flag = 0;
    ctx->must_understand = 0;
    ctx->null_flag = 0;
    ctx->namespace_state = 0;
    ctx->attributes_set = 0;
    ctx->peeked = 0;
    ctx->other_flag = 0;
    ctx->root_flag = 0;
    ctx->allocated = 0;
    ctx->wsu_id_flag = 0;
    ctx->nesting_level = 0;
    ctx->next_id = 0;
}
