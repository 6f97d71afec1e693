// query_port.cpp - queries and pings over the wire. The contract has no operations for them; here a Body
// holds one of them in an element that states its type or has its type's name.
#include "query.h"

namespace service {

namespace {

protocol__QueryResponses *query(call &c, protocol__QueryRequests &requests)
{
    return answer_queries(c, requests);
}

protocol__PingResponse *ping(call &c, protocol__PingRequest &)
{
    return make<protocol__PingResponse>(c.ctx);
}

constexpr operation OPERATIONS[] = {
    row<query>("protocol:QueryRequests", "protocol:QueryResponses"),
    row<ping>("protocol:PingRequest", "protocol:PingResponse"),
};

} // namespace

const port query_port = {.name = "Query", .by_type = true, .operations = OPERATIONS};

} // namespace service
