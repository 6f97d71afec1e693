// problem_report_port.cpp - the operations on problem reports, and the first answers that a report gets.
#include <zuv_client_pro/protocolProblemReport.h>

#include "catalogue.h"
#include "comparison.h"
#include "report_rules.h"

namespace service {

namespace {

using report = protocolProblemReport__ProblemReportContent;
using state = protocolProblemReport__ProblemReportState;
using acknowledgment = protocolProblemReport__Answer_x002eServer_x002eAdministration_x002eAcknowledgment;
using action_answer = protocolProblemReport__Answer_x002eServer_x002eAction;
using install = protocolProblemReport__Action_x002eUpdate_x002eInstall;

constexpr std::size_t SEARCHED_MAX =
    64 << 10; // bytes of a title and of a description that are searched for known problems

report_rules<report> rules_of(call &c)
{
    return {c, "ProblemReport", "problemreport"};
}

bool finds(text_operator op, const std::string &wanted, std::string_view text)
{
    return word_search(op, wanted, false).found_in(text);
}

// How sure the service is that an update helps, in percent; null if it doesn't.
const char *confidence_of(std::string_view text, const update_record &update)
{
    if (finds(text_operator::contains_phrase, text_of(update.updateId), text))
        return "90";
    for (const protocolUpdateOrder__Corrected *corrected : update.corrected)
        if (corrected->problemReport != nullptr &&
            finds(text_operator::contains_all_words, text_of(corrected->problemReport->title), text))
            return "75";
    return nullptr;
}

// Proposes to install an update.
action_answer *proposal(call &c, const update_record &update, const char *confidence)
{
    auto *const information = make<protocolProblemReport__UpdateInformation>(c.ctx);
    if (!update.subject.empty())
        information->product = update.subject.front()->product;
    information->updateId = update.updateId;
    information->updateIdQualifier = update.updateIdQualifier;
    information->confidence = make_text(c.ctx, confidence);
    auto *const action = make<install>(c.ctx);
    action->description = make_text(c.ctx, "Install " + text_of(update.name) + ".");
    action->originator = make_text(c.ctx, "zuv-service");
    action->updateInformation.push_back(information);
    auto *const answer = make<action_answer>(c.ctx);
    answer->description = make_text(c.ctx, "An update is known to help with such a problem.");
    answer->action = action;
    return answer;
}

void give_answers(call &c, report &r)
{
    auto *const received = make<acknowledgment>(c.ctx);
    received->description = make_text(c.ctx, "The report was received and is being worked on.");
    r.answer = {received};
    std::string text = text_of(r.title).substr(0, SEARCHED_MAX) + "\n";
    text.append(text_of(r.problemDescription), 0, SEARCHED_MAX);
    for (const update_record *update : the_catalogue().all())
        if (const char *const confidence = confidence_of(text, *update))
            r.answer.push_back(proposal(c, *update, confidence));
}

void note_change(call &c, report &r)
{
    r.lastModifiedDateTime = make_text(c.ctx, now_text(c.ctx));
}

report *get(call &c, _protocolProblemReport__getRequest &)
{
    return rules_of(c).get();
}

report *submit(call &c, report &request)
{
    note_change(c, request);
    request.submitDateTime = request.lastModifiedDateTime;
    request.state = make_value(c.ctx, state::open);
    give_answers(c, request);
    return rules_of(c).keep(request);
}

report *attach(call &c, _protocolProblemReport__attachRequest &request)
{
    return rules_of(c).attach(request.attachment, request.dataPortPreference);
}

report *attach_status(call &c, protocol__AttachStatusRequest &request)
{
    return rules_of(c).note_progress(request);
}

report *remove(call &c, report &request)
{
    return rules_of(c).remove(request);
}

constexpr operation OPERATIONS[] = {
    row<get>("protocolProblemReport:getRequest", "protocolProblemReport:getResponse"),
    row<submit>("protocolProblemReport:submitRequest", "protocolProblemReport:submitResponse"),
    row<attach>("protocolProblemReport:attachRequest", "protocolProblemReport:attachResponse"),
    row<attach_status>("protocolProblemReport:attachStatusRequest",
                       "protocolProblemReport:attachStatusResponse"),
    row<remove>("protocolProblemReport:removeRequest", "protocolProblemReport:removeResponse"),
};

} // namespace

const port problem_report_port = {.name = "ProblemReport", .operations = OPERATIONS};

} // namespace service
