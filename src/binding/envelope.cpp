// envelope.cpp - header, fault and detail of the SOAP envelope: made, written, read, reached by version.
//
// Elsewhere: what becomes of a received fault (exchange/fault_receive.cpp), texts of errors (exchange/error_text.cpp).
#include "binding/envelope.h"

#include <new>
#include <type_traits>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_envelope.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>
#include <zuv_client_pro/soap_io.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_primitive.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/soap_xml.h>
#include <zuv_client_pro/type_ids.h>

#include "binding/member_read.h"
#include "binding/member_write.h"
#include "core/failure.h"
#include "traits_protocol.h"

namespace binding {

namespace {

// Calls `use` with a null pointer of the record's type.
template <class Use> auto with_record(int type_id, Use use)
{
    switch (type_id) {
    case SOAP_TYPE_SOAP_ENV__Header:
        return use(static_cast<SOAP_ENV__Header *>(nullptr));
    case SOAP_TYPE_SOAP_ENV__Code:
        return use(static_cast<SOAP_ENV__Code *>(nullptr));
    case SOAP_TYPE_SOAP_ENV__Detail:
        return use(static_cast<SOAP_ENV__Detail *>(nullptr));
    case SOAP_TYPE_SOAP_ENV__Reason:
        return use(static_cast<SOAP_ENV__Reason *>(nullptr));
    default:
        return use(static_cast<SOAP_ENV__Fault *>(nullptr));
    }
}

template <class R> constexpr int id_of();
template <> constexpr int id_of<SOAP_ENV__Header>()
{
    return SOAP_TYPE_SOAP_ENV__Header;
}
template <> constexpr int id_of<SOAP_ENV__Code>()
{
    return SOAP_TYPE_SOAP_ENV__Code;
}
template <> constexpr int id_of<SOAP_ENV__Detail>()
{
    return SOAP_TYPE_SOAP_ENV__Detail;
}
template <> constexpr int id_of<SOAP_ENV__Reason>()
{
    return SOAP_TYPE_SOAP_ENV__Reason;
}
template <> constexpr int id_of<SOAP_ENV__Fault>()
{
    return SOAP_TYPE_SOAP_ENV__Fault;
}

// The error says that a value isn't what it should be, in XML that is sound. Characters that XML can't carry
// are errors of strict mode alone, which holds the tags after them to their names.
bool is_bad_value(const soap *ctx)
{
    switch (ctx->error) {
    case SOAP_TAG_MISMATCH:
    case SOAP_TYPE_MISMATCH:
    case SOAP_MUST_UNDERSTAND:
    case SOAP_NAMESPACE_ERROR:
    case SOAP_NIL:
    case SOAP_DUPLICATE_ID:
    case SOAP_MISSING_ID:
    case SOAP_ID_CONFLICT:
    case SOAP_REQUIRED:
    case SOAP_PROHIBITED:
    case SOAP_OCCURS:
        return true;
    case SOAP_SYNTAX_ERROR:
    case SOAP_UTF_ERROR:
        return (ctx->mode & MODE_STRICT) != 0;
    default:
        return false;
    }
}

template <class R> R *make(soap *ctx)
{
    return static_cast<R *>(soap_instantiate(ctx, id_of<R>(), nullptr, nullptr, nullptr));
}

// --- reading: a loop over the members of a record, each taken once ---

// The members of one record while it is read. `taken` remembers which were met.
struct record_reader {
    soap *ctx;
    std::uint64_t taken = 0;
    int next = 0;
    bool hit = false;

    template <class Read> void member(Read read)
    {
        const std::uint64_t bit = std::uint64_t{1} << next++;
        if (hit || (taken & bit) || (ctx->error != SOAP_TAG_MISMATCH && ctx->error != SOAP_NO_TAG))
            return;
        if (read()) {
            taken |= bit;
            hit = true;
        }
    }
};

bool chars_in(soap *ctx, const char *tag, char **place, int form)
{
    return soap_string_element_in(ctx, tag, place, nullptr, SOAP_TYPE_chars_xsd__string, form, -1, -1) !=
           nullptr;
}

// A fault of the detail. What is wrong with one of its values costs that value alone.
bool fault_in(soap *ctx, const class_ops &ops, const char *tag, void **place)
{
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    soap_tag_unread(ctx);
    if (ctx->null_flag || ctx->element_href[0] == '#')
        return class_pointer_in(ctx, ops, tag, place);
    const class_ops *actual = &ops;
    *place = class_instantiate(ctx, ops, -1, ctx->element_type, nullptr, &actual);
    if (*place == nullptr || soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    const std::uint32_t level = ctx->nesting_level;
    const bool body = ctx->has_body != 0;
    void *read = actual->read(ctx, *actual, tag, *place);
    while (read == nullptr && drop_bad_value(ctx, level)) {
        if (!body || ctx->nesting_level < level)
            return true;
        read = read_further_members(ctx, *actual, tag, *place);
    }
    return read != nullptr;
}

template <class R> bool record_in(soap *ctx, const char *tag, R **place);

void try_members(record_reader &r, SOAP_ENV__Header &header)
{
    r.member([&] {
        return class_pointer_in(r.ctx, ops_of<protocol__Header>, "protocol:header",
                                reinterpret_cast<void **>(&header.header));
    });
}

void try_members(record_reader &r, SOAP_ENV__Code &code)
{
    r.member([&] { return chars_in(r.ctx, "SOAP-ENV:Value", &code.Value, 2); });
    r.member([&] { return record_in(r.ctx, "SOAP-ENV:Subcode", &code.Subcode); });
}

void try_members(record_reader &r, SOAP_ENV__Reason &reason)
{
    r.member([&] { return chars_in(r.ctx, "SOAP-ENV:Text", &reason.Text, 1); });
}

void try_members(record_reader &r, SOAP_ENV__Detail &detail)
{
#define TRY_FAULT(name)                                                                                      \
    r.member([&] {                                                                                           \
        return fault_in(r.ctx, ops_of<protocol__##name>, traits<protocol__##name>::xml_type,                 \
                        reinterpret_cast<void **>(&detail.name));                                            \
    });
    SOAP_DETAIL_FAULTS(TRY_FAULT)
#undef TRY_FAULT
    r.member([&] {
        if (r.ctx->error != SOAP_TAG_MISMATCH)
            return false;
        detail.fault = soap_read_element(r.ctx, &detail.__type);
        if (detail.fault == nullptr)
            detail.__type = 0;
        return detail.fault != nullptr;
    });
    r.member([&] { return soap_raw_element_in(r.ctx, "-any", &detail.__any) != nullptr; });
}

void try_members(record_reader &r, SOAP_ENV__Fault &fault)
{
    r.member([&] { return chars_in(r.ctx, "faultcode", &fault.faultcode, 2); });
    r.member([&] { return chars_in(r.ctx, "faultstring", &fault.faultstring, 1); });
    r.member([&] { return chars_in(r.ctx, "faultactor", &fault.faultactor, 1); });
    r.member([&] { return record_in(r.ctx, "detail", &fault.detail); });
    r.member([&] { return record_in(r.ctx, "SOAP-ENV:Code", &fault.Code); });
    r.member([&] { return record_in(r.ctx, "SOAP-ENV:Reason", &fault.Reason); });
    r.member([&] { return chars_in(r.ctx, "SOAP-ENV:Node", &fault.Node, 1); });
    r.member([&] { return chars_in(r.ctx, "SOAP-ENV:Role", &fault.Role, 1); });
    r.member([&] { return record_in(r.ctx, "SOAP-ENV:Detail", &fault.Detail); });
}

// A bad value in a fault must not hide the fault. A header is as good as its values.
template <class R> constexpr bool is_of_fault = !std::is_same_v<R, SOAP_ENV__Header>;

template <class R> bool read_members_of(soap *ctx, R &record)
{
    record_reader reader{ctx};
    const std::uint32_t level = ctx->nesting_level;
    for (;;) {
        fail(ctx, SOAP_TAG_MISMATCH);
        reader.next = 0;
        reader.hit = false;
        try_members(reader, record);
        if (reader.hit)
            continue;
        if (ctx->error == SOAP_TAG_MISMATCH)
            ctx->error = soap_element_skip(ctx);
        if (ctx->error == SOAP_NO_TAG)
            return true;
        if (ctx->error && (!is_of_fault<R> || !drop_bad_value(ctx, level)))
            return false;
    }
}

template <class R> R *record_content_in(soap *ctx, const char *tag, R *record)
{
    const bool body = ctx->has_body != 0;
    if (ctx->element_id[0] && !soap_object_register(ctx, ctx->element_id, record, id_of<R>(), sizeof *record,
                                                    0, nullptr, nullptr, nullptr))
        return nullptr;
    if (body && (!read_members_of(ctx, *record) || soap_element_in_end(ctx, tag)))
        return nullptr;
    return record;
}

// After the start tag; nil gives null.
template <class R> bool record_new_in(soap *ctx, const char *tag, R **place)
{
    *place = nullptr;
    if (ctx->null_flag)
        return !ctx->has_body || soap_element_in_end(ctx, tag) == 0;
    *place = make<R>(ctx);
    return *place && record_content_in(ctx, tag, *place);
}

// A member of a record: `place` stays where it is until the message ends, so it may wait for a reference.
template <class R> bool record_in(soap *ctx, const char *tag, R **place)
{
    if (soap_element_in_begin(ctx, tag, 1, nullptr))
        return false;
    if (ctx->null_flag || ctx->element_href[0] != '#')
        return record_new_in(ctx, tag, place);
    const bool body = ctx->has_body != 0;
    *place = nullptr;
    return soap_object_forward_ptr(ctx, ctx->element_href, reinterpret_cast<void **>(place), id_of<R>(),
                                   sizeof **place, 0) &&
           (!body || soap_element_in_end(ctx, tag) == 0);
}

// A record by itself.
template <class R> bool lone_record_in(soap *ctx, const char *tag, R **place)
{
    return soap_element_in_begin(ctx, tag, 1, nullptr) == 0 && record_new_in(ctx, tag, place);
}

// --- writing ---

int chars_out(soap *ctx, const char *tag, char *text)
{
    if (text == nullptr)
        return SOAP_OK;
    if (soap_element_out_begin(ctx, tag, -1, "") || soap_text_write(ctx, text, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

int code_out(soap *ctx, const char *tag, const char *code)
{
    if (code == nullptr)
        return SOAP_OK;
    const char *mapped = soap_qname_write_map(ctx, code);
    if (mapped == nullptr || soap_element_out_begin(ctx, tag, -1, "") || soap_text_write(ctx, mapped, 0))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

template <class R>
int record_out(soap *ctx, const char *tag, const R *record, int id = 0, const char *type = "");

int members_out(soap *ctx, const SOAP_ENV__Header &header)
{
    ctx->must_understand = 1; // taken by the start tag of the block, or by its absence
    return class_pointer_out(ctx, ops_of<protocol__Header>, "protocol:header", -1, header.header, "");
}

int members_out(soap *ctx, const SOAP_ENV__Code &code)
{
    if (code_out(ctx, "SOAP-ENV:Value", code.Value))
        return ctx->error;
    return record_out(ctx, "SOAP-ENV:Subcode", code.Subcode);
}

int members_out(soap *ctx, const SOAP_ENV__Reason &reason)
{
    if (reason.Text == nullptr)
        return SOAP_OK;
    if (ctx->soap_version == 2 &&
        soap_attr_set(ctx, "xml:lang", ctx->language != nullptr ? ctx->language : "en", 1))
        return ctx->error;
    return chars_out(ctx, "SOAP-ENV:Text", reason.Text);
}

int members_out(soap *ctx, const SOAP_ENV__Detail &detail)
{
    if (detail.__any != nullptr && soap_send_text(ctx, detail.__any))
        return ctx->error;
#define PUT_FAULT(name)                                                                                      \
    if (detail.name && class_pointer_out(ctx, ops_of<protocol__##name>, traits<protocol__##name>::xml_type,  \
                                         -1, detail.name, ""))                                               \
        return ctx->error;
    SOAP_DETAIL_FAULTS(PUT_FAULT)
#undef PUT_FAULT
    return detail.fault != nullptr ? soap_write_element(ctx, detail.fault, nullptr, -1, detail.__type) : 0;
}

int members_out(soap *ctx, const SOAP_ENV__Fault &fault)
{
    if (code_out(ctx, "faultcode", fault.faultcode) || chars_out(ctx, "faultstring", fault.faultstring) ||
        chars_out(ctx, "faultactor", fault.faultactor) || record_out(ctx, "detail", fault.detail) ||
        record_out(ctx, "SOAP-ENV:Code", fault.Code) || record_out(ctx, "SOAP-ENV:Reason", fault.Reason) ||
        chars_out(ctx, "SOAP-ENV:Node", fault.Node) || chars_out(ctx, "SOAP-ENV:Role", fault.Role))
        return ctx->error;
    return record_out(ctx, "SOAP-ENV:Detail", fault.Detail);
}

template <class R> int record_out(soap *ctx, const char *tag, const R *record, int id, const char *type)
{
    if (!record)
        return SOAP_OK;
    if (soap_element_out_begin(ctx, tag, id, type) || members_out(ctx, *record))
        return ctx->error;
    return soap_element_out_end(ctx, tag);
}

// --- marking ---

void mark_detail(soap *ctx, const SOAP_ENV__Detail *detail)
{
    if (detail == nullptr)
        return;
#define MARK_FAULT(name) class_pointer_mark(ctx, ops_of<protocol__##name>, detail->name);
    SOAP_DETAIL_FAULTS(MARK_FAULT)
#undef MARK_FAULT
    soap_mark_object(ctx, detail->fault, detail->__type);
}

void mark_record(soap *ctx, const SOAP_ENV__Header &header)
{
    class_pointer_mark(ctx, ops_of<protocol__Header>, header.header);
}
void mark_record(soap *, const SOAP_ENV__Code &) {}
void mark_record(soap *, const SOAP_ENV__Reason &) {}
void mark_record(soap *ctx, const SOAP_ENV__Detail &detail)
{
    mark_detail(ctx, &detail);
}
void mark_record(soap *ctx, const SOAP_ENV__Fault &fault)
{
    mark_detail(ctx, fault.detail);
    mark_detail(ctx, fault.Detail);
}

} // namespace

bool drop_bad_value(soap *ctx, std::uint32_t level)
{
    const int error = ctx->error;
    if (!is_bad_value(ctx))
        return false;
    ctx->error = 0;
    if (ctx->peeked && ctx->tag[0] && ctx->nesting_level == level) { // refused before it was entered
        ctx->peeked = 0;
        ctx->nesting_level += static_cast<unsigned int>(ctx->has_body != 0);
    }
    while (ctx->nesting_level > level) {
        if (soap_element_in_end(ctx, nullptr)) {
            ctx->error = error;
            return false;
        }
    }
    return true;
}

std::size_t envelope_size(int type_id)
{
    return with_record(type_id, [](auto *r) { return sizeof *r; });
}

void *envelope_create(int type_id, int count)
{
    return with_record(type_id, [count](auto *r) -> void * {
        using R = std::remove_pointer_t<decltype(r)>;
        if (count < 0)
            return new (std::nothrow) R();
        return new (std::nothrow) R[static_cast<std::size_t>(count)]();
    });
}

void envelope_destroy(int type_id, void *record, int count)
{
    with_record(type_id, [=](auto *r) {
        using R = std::remove_pointer_t<decltype(r)>;
        if (count < 0)
            delete static_cast<R *>(record);
        else
            delete[] static_cast<R *>(record);
    });
}

void *envelope_in(soap *ctx, int type_id, const char *tag, void *record)
{
    return with_record(type_id, [=](auto *r) -> void * {
        using R = std::remove_pointer_t<decltype(r)>;
        R *made = static_cast<R *>(record);
        if (!made)
            return lone_record_in(ctx, tag, &made) ? made : nullptr;
        return soap_element_in_begin(ctx, tag, 0, nullptr) ? nullptr : record_content_in(ctx, tag, made);
    });
}

int envelope_out(soap *ctx, int type_id, const char *tag, int id, const void *record, const char *type)
{
    return with_record(type_id, [=](auto *r) {
        using R = std::remove_pointer_t<decltype(r)>;
        return record_out(ctx, tag, static_cast<const R *>(record), soap_element_id(ctx, id, record, type_id),
                          type);
    });
}

void envelope_mark(soap *ctx, int type_id, const void *record)
{
    with_record(type_id, [=](auto *r) {
        using R = std::remove_pointer_t<decltype(r)>;
        mark_record(ctx, *static_cast<const R *>(record));
    });
}

} // namespace binding

using namespace binding;

// --- the header's turn ---

void soap_header_record(soap *ctx)
{
    if (ctx->header == nullptr)
        ctx->header = make<SOAP_ENV__Header>(ctx);
}

void soap_mark_header(soap *ctx)
{
    if (ctx->header != nullptr)
        mark_record(ctx, *ctx->header);
}

int soap_header_put(soap *ctx)
{
    if (ctx->header == nullptr)
        return SOAP_OK;
    ctx->message_part = PART_HEADER;
    if (record_out(ctx, "SOAP-ENV:Header", ctx->header))
        return ctx->error;
    ctx->message_part = PART_AFTER_HEADER;
    return SOAP_OK;
}

int soap_header_get(soap *ctx)
{
    const std::uint32_t level = ctx->nesting_level;
    ctx->message_part = PART_HEADER;
    SOAP_ENV__Header *header = nullptr;
    if (!lone_record_in(ctx, "SOAP-ENV:Header", &header)) {
        header = nullptr;
        if (ctx->error == SOAP_TAG_MISMATCH && ctx->nesting_level == level)
            ctx->error = 0;
    }
    ctx->header = header;
    if (ctx->error)
        return ctx->error;
    ctx->message_part = PART_AFTER_HEADER;
    if (ctx->error == 0 && ctx->on_soap_header != nullptr)
        ctx->error = ctx->on_soap_header(ctx);
    return ctx->error;
}

// --- the fault's turn ---

void soap_mark_fault(soap *ctx)
{
    if (ctx->fault != nullptr)
        mark_record(ctx, *ctx->fault);
}

int soap_fault_put(soap *ctx)
{
    soap_fault_record(ctx);
    return ctx->fault != nullptr ? record_out(ctx, "SOAP-ENV:Fault", ctx->fault) : ctx->error;
}

int soap_fault_read(soap *ctx)
{
    SOAP_ENV__Fault *fault = nullptr;
    if (lone_record_in(ctx, "SOAP-ENV:Fault", &fault))
        ctx->error = 0;
    else
        fault = nullptr;
    ctx->fault = fault;
    return ctx->error;
}

// --- accessors ---

void soap_fault_record(soap *ctx)
{
    if (ctx->fault == nullptr)
        ctx->fault = make<SOAP_ENV__Fault>(ctx);
    if (ctx->fault == nullptr || ctx->soap_version != 2)
        return;
    if (ctx->fault->Code == nullptr)
        ctx->fault->Code = make<SOAP_ENV__Code>(ctx);
    if (ctx->fault->Reason == nullptr)
        ctx->fault->Reason = make<SOAP_ENV__Reason>(ctx);
}

namespace {

// Used where memory ran out: written and never read. In the thread's first block, so that the library
// needs nothing of the dynamic loader's.
const char **thrown_away()
{
    [[gnu::tls_model("initial-exec")]] thread_local const char *place;
    place = nullptr;
    return &place;
}

const char **place_of(char **text)
{
    return const_cast<const char **>(text);
}

SOAP_ENV__Detail *detail_record(soap *ctx)
{
    soap_fault_record(ctx);
    if (ctx->fault == nullptr)
        return nullptr;
    SOAP_ENV__Detail *&detail = ctx->soap_version == 1 ? ctx->fault->detail : ctx->fault->Detail;
    if (detail == nullptr)
        detail = make<SOAP_ENV__Detail>(ctx);
    return detail;
}

} // namespace

const char **soap_fault_code_field(soap *ctx)
{
    soap_fault_record(ctx);
    if (ctx->fault == nullptr)
        return thrown_away();
    if (ctx->soap_version != 2)
        return place_of(&ctx->fault->faultcode);
    return ctx->fault->Code != nullptr ? place_of(&ctx->fault->Code->Value) : thrown_away();
}

const char **soap_fault_subcode_field(soap *ctx)
{
    soap_fault_record(ctx);
    if (ctx->fault == nullptr)
        return thrown_away();
    if (ctx->soap_version != 2)
        return place_of(&ctx->fault->faultcode);
    if (ctx->fault->Code == nullptr)
        return thrown_away();
    if (ctx->fault->Code->Subcode == nullptr)
        ctx->fault->Code->Subcode = make<SOAP_ENV__Code>(ctx);
    return ctx->fault->Code->Subcode != nullptr ? place_of(&ctx->fault->Code->Subcode->Value) : thrown_away();
}

const char **soap_fault_string_field(soap *ctx)
{
    soap_fault_record(ctx);
    if (ctx->fault == nullptr)
        return thrown_away();
    if (ctx->soap_version != 2)
        return place_of(&ctx->fault->faultstring);
    return ctx->fault->Reason != nullptr ? place_of(&ctx->fault->Reason->Text) : thrown_away();
}

const char **soap_fault_detail_field(soap *ctx)
{
    SOAP_ENV__Detail *detail = detail_record(ctx);
    return detail != nullptr ? place_of(&detail->__any) : thrown_away();
}

const char *soap_fault_subcode_value(soap *ctx)
{
    const SOAP_ENV__Fault *fault = ctx->fault;
    if (ctx->soap_version != 2 || fault == nullptr || fault->Code == nullptr ||
        (fault->Code->Subcode == nullptr))
        return nullptr;
    return fault->Code->Subcode->Value;
}

const char *soap_fault_detail_value(soap *ctx)
{
    if (ctx->fault == nullptr)
        return nullptr;
    const SOAP_ENV__Detail *detail = ctx->soap_version == 1 ? ctx->fault->detail : ctx->fault->Detail;
    return detail != nullptr ? detail->__any : nullptr;
}
