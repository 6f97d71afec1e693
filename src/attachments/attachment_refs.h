// attachment_refs.h - the queue of references that wait for their attachment.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

// Queues a copy of `wanted`, whose places, type, options and id are set. 0 or 20.
int attachment_ref_queue(soap *ctx, const soap_attachment_ref &wanted);
