// update_order_port.cpp - the operations on update orders.
//
// Elsewhere: which updates an order selects (expansion.cpp), authentication (authentication.cpp).
#include <zuv_client_pro/protocolUpdateOrder.h>

#include "authentication.h"
#include "expansion.h"
#include "filter.h"
#include "report_rules.h"

namespace service {

namespace {

using order = protocolUpdateOrder__UpdateOrderContent;
using state = protocolUpdateOrder__UpdateOrderState;
using detail = protocolUpdateOrder__UpdateIdExpansionDetail;

constexpr std::size_t NAMES_MAX = 10000;    // identifiers and scopes of one order
constexpr std::size_t DELIVERIES_MAX = 100; // delivery preferences of one order

report_rules<order> rules_of(call &c)
{
    return {c, "UpdateOrder", "updateorder"};
}

bool is_true(const bool *member)
{
    return member != nullptr && *member;
}

// A copy of a shared record, for changes.
template <class T> T *copy_of(call &c, const T &original)
{
    T *const copy = make<T>(c.ctx);
    *copy = original;
    copy->soap = c.ctx;
    return copy;
}

// The record of an update, with the parts that the order asks for.
update_record *meta_data_for(call &c, const order &o, const update_record &update)
{
    update_record *const answered = copy_of(c, update);
    if (!is_true(o.includeCorrected))
        answered->corrected.clear();
    if (o.includeOperatingPlatforms && is_true(o.includeFixableComponents))
        return answered;
    for (protocol__Identity *&subject : answered->subject) {
        subject = copy_of(c, *subject);
        if (!o.includeOperatingPlatforms)
            subject->operatingPlatform = nullptr;
        if (!is_true(o.includeFixableComponents))
            subject->fixableComponent = subject->fixableComponentName = subject->fixableComponentVersion =
                nullptr;
    }
    return answered;
}

void list_chosen(call &c, order &o, const update_record &update)
{
    o.updateIdExpansion.push_back(text_of(update.updateId));
    if (!o.includeUpdateIdExpansionDetail)
        return;
    auto *const answered = make<detail>(c.ctx);
    answered->updateId = update.updateId;
    answered->updateIdQualifier = update.updateIdQualifier;
    if (o.includeMetaData)
        answered->metaData.push_back(meta_data_for(c, o, update));
    o.updateIdExpansionDetail.push_back(answered);
}

// An unknown update is listed even if no details are wanted: it is why the order is not complete.
void list_unknown(call &c, order &o, const unknown_update &unknown)
{
    auto *const answered = make<detail>(c.ctx);
    answered->updateId = make_text(c.ctx, unknown.id);
    if (!unknown.qualifier.empty())
        answered->updateIdQualifier = make_text(c.ctx, unknown.qualifier);
    auto *const fault = make_fault<protocol__Client_x002eObjectNotFound>(
        c.ctx, "No update has the identifier " + unknown.id + ".");
    fault->uri.push_back(unknown.id);
    answered->error = fault;
    o.updateIdExpansionDetail.push_back(answered);
}

bool wants_physical(const protocolUpdateOrder__DeliveryPreference &preference)
{
    return preference.medium != nullptr && *preference.medium == protocol__Medium::physical;
}

// Null if the service can deliver as one of the preferences asks; otherwise what is wrong with the last.
protocol__Fault *undeliverable(call &c, const order &o)
{
    const protocolUpdateOrder__DeliveryPreference *last = nullptr;
    for (const protocolUpdateOrder__DeliveryPreference *preference : o.deliveryPreference) {
        if (preference == nullptr)
            continue;
        if (!wants_physical(*preference) &&
            serves(c, preference->dataPortPreference, protocol__Direction::out))
            return nullptr;
        last = preference;
    }
    if (last == nullptr || !wants_physical(*last))
        return last == nullptr ? nullptr
                               : incompatibility(c, last->dataPortPreference, protocol__Direction::out);
    auto *const refused = make_fault<protocol__Client_x002eDeliveryIncompatibility>(
        c.ctx, "The service delivers electronically only.");
    refused->deliverySupported.push_back(make<protocol__DeliverySupported>(c.ctx));
    refused->deliverySupported.back()->medium = make_value(c.ctx, protocol__Medium::electronic);
    return refused;
}

protocol__Attachment *delivery_of(call &c, const update_record &update)
{
    protocol__Attachment *const delivered = copy_of(c, update_package());
    const std::string name = std::string(UPDATE_DATA) + text_of(update.updateId);
    delivered->thisURI = make_text(c.ctx, "urn:zuv:attachment:" + fresh_uuid());
    delivered->state = make_value(c.ctx, protocol__AttachmentState::pending);
    delivered->size = update.size;
    delivered->reference.push_back(text_of(update.updateId));
    delivered->dataPort.push_back(make_data_port(c, protocol__Direction::out, name));
    delivered->dataPort.front()->attachmentURI = delivered->thisURI;
    delivered->dataURI = delivered->dataPort.front()->dataURI;
    return delivered;
}

state deliver(call &c, order &o, const expansion &found)
{
    if (found.chosen.empty())
        return state::complete_x002enoUpdates;
    protocol__Fault *const fault = o.includeData ? undeliverable(c, o) : nullptr;
    if (fault != nullptr) {
        o.error.push_back(fault);
        return found.unknown.empty() ? state::preprocessed_x002eidentified
                                     : state::preprocessed_x002eidentified_x002epartial;
    }
    for (const chosen_update &chosen : found.chosen)
        if (o.includeData && text_of(chosen.update->size) != "0")
            o.attachment.push_back(delivery_of(c, *chosen.update));
    return found.unknown.empty() ? state::complete_x002eavailable
                                 : state::complete_x002eavailable_x002epartial;
}

// Each name and each preference costs the service more than the client that repeats it.
void refuse_endless(call &c, const order &o)
{
    if (o.updateId.size() + o.updateIdQualified.size() + o.updateScope.size() > NAMES_MAX)
        refuse<protocol__Client_x002eInvalidRequest>(c.ctx, "The order names too many updates and scopes.");
    if (o.deliveryPreference.size() > DELIVERIES_MAX)
        refuse<protocol__Client_x002eInvalidRequest>(c.ctx, "The order holds too many delivery preferences.");
}

expansion expansion_of(call &c, const order &o)
{
    if (!names_updates(o))
        refuse<protocol__Client_x002eInsufficientInformation>(
            c.ctx, "The order names no updates: neither identifiers nor a scope nor a filter.");
    refuse_endless(c, o);
    try {
        return expand(c.work.filters, the_catalogue(), o);
    } catch (const filter_error &error) {
        refuse_filter(c.ctx, error);
    }
}

order *submit(call &c, order &request)
{
    const expansion found = expansion_of(c, request);
    request.updateIdExpansion.clear();
    request.updateIdExpansionDetail.clear();
    request.error.clear();
    for (const chosen_update &chosen : found.chosen)
        list_chosen(c, request, *chosen.update);
    for (const unknown_update &unknown : found.unknown)
        list_unknown(c, request, unknown);
    request.state = make_value(c.ctx, deliver(c, request, found));
    rules_of(c).documents().keep(request);
    return &request;
}

order *get(call &c, _protocolUpdateOrder__getRequest &)
{
    return rules_of(c).get();
}

order *close(call &c, _protocolUpdateOrder__closeRequest &)
{
    return rules_of(c).end(state::closed);
}

order *cancel(call &c, _protocolUpdateOrder__cancelRequest &)
{
    return rules_of(c).end(state::cancelled);
}

order *remove(call &c, order &request)
{
    return rules_of(c).remove(request);
}

constexpr operation OPERATIONS[] = {
    row<get>("protocolUpdateOrder:getRequest", "protocolUpdateOrder:getResponse"),
    row<submit>("protocolUpdateOrder:submitRequest", "protocolUpdateOrder:submitResponse"),
    row<close>("protocolUpdateOrder:closeRequest", "protocolUpdateOrder:closeResponse"),
    row<cancel>("protocolUpdateOrder:cancelRequest", "protocolUpdateOrder:cancelResponse"),
    row<remove>("protocolUpdateOrder:removeRequest", "protocolUpdateOrder:removeResponse"),
    row<authenticate>("protocolUpdateOrder:authenticateRequest", "protocolUpdateOrder:authenticateResponse"),
};

} // namespace

const port update_order_port = {.name = "UpdateOrder", .operations = OPERATIONS};

} // namespace service
