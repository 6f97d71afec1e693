// attachment_list.h - what holds of all attachments of a message, and what is reported of a wrong one.
#pragma once

#include <zuv_client_pro/soap.h>
#include <zuv_client_pro/soap_attachment.h>

// Empties the lists of attachments to send. The records are managed memory.
inline void attachments_forget(soap *ctx)
{
    ctx->dime.first = ctx->dime.last = nullptr;
    ctx->mime.first = ctx->mime.last = nullptr;
}

// Two attachments of one id, or one with that of the message's own part (null: none), leave open which of
// them a reference means, and two receivers may decide differently: `error` for such a list. 0, `error`
// or 20.
int attachment_ids_check(soap *ctx, const soap_attachment *list, const char *message_id, int error);

// The same for the attachments that go out with the message under way: 0, 20, 32 or 36.
int attachment_ids_check_out(soap *ctx);

// Makes a fault with a text of its own for an error, which it returns.
[[gnu::format(printf, 3, 4)]] int attachment_fail(soap *ctx, int error, const char *format, ...);

// Queues a copy of `wanted`, whose places, type, options and id are set. 0 or 20.
int attachment_ref_queue(soap *ctx, const soap_attachment_ref &wanted);

// Enters the attachment that the value goes out as, in the order of its number, and makes the message one
// with attachments. `holder` begins with the address of the bytes and their number (an int). False: the value
// is in place. SOAP_OUT_OF_MEMORY in ctx->error if memory runs out.
bool attachment_value_mark(soap *ctx, const void *holder, const char *id_text, const char *type,
                           const char *options);
