// attachment_list.h - what the readers of attachments check about all of them.
#pragma once

#include <zuv_client_pro/soap_attachment.h>

// Two attachments of one id leave open which of them a reference means, and two receivers may decide
// differently: `error` for such a list. 0, `error` or 20.
int attachment_ids_check(soap *ctx, const soap_attachment *list, int error);
