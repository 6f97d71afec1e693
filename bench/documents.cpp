// documents.cpp - problem reports from a generator with a fixed seed: a realistic mix of lengths and forms.
#include "documents.h"

#include <random>
#include <string>
#include <vector>

#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/soap_memory.h>
#include <zuv_client_pro/soap_registry.h>
#include <zuv_client_pro/type_ids.h>

namespace {

using report_class = protocolProblemReport__ProblemReportContent;

constexpr std::size_t FRAME_BYTES = 1500; // envelope with all declarations, and the report around the others
constexpr std::size_t NESTED_REPORT_BYTES = 9830; // on average

class document_maker {
public:
    explicit document_maker(soap *context) : ctx(context) {}

    report_class *outer()
    {
        auto *report = make<report_class>(SOAP_TYPE_protocolProblemReport__ProblemReportContent);
        report->clientURI = uri();
        report->state = code<protocolProblemReport__ProblemReportState>(8);
        report->title = prose(20, 60);
        report->occurrenceDateTime = date_time();
        report->severity = number(5);
        report->submitter = identity(false);
        return report;
    }

    report_class *nested()
    {
        report_class *report = outer();
        report->thisURI = {*uri(), *uri()};
        report->test = make_plain<bool>();
        *report->test = chance(4);
        report->subject = identity(true);
        report->subjectEnvironment = many<protocol__Identity>(2, [&] { return identity(false); });
        report->problemType = codes<protocolProblemReport__ProblemType>(2, 9);
        report->problemDescription = prose(200, 1200);
        report->submitDateTime = date_time();
        report->impact = codes<protocolProblemReport__Impact>(2, 5);
        report->actionTaken = many<protocolProblemReport__Action>(3, [&] { return action(); });
        report->reference = {*uri()};
        report->notes = {*prose(40, 200), *prose(100, 600)};
        report->richNotes = many<protocolProblemReport__ProblemReportRichNotes>(2, [&] { return notes(); });
        report->contact = many<protocol__Contact>(2, [&] { return contact(); });
        return report;
    }

private:
    template <class T> T *make(int type_id)
    {
        return static_cast<T *>(soap_instantiate(ctx, type_id, nullptr, nullptr, nullptr));
    }

    template <class T> T *make_plain() { return static_cast<T *>(soap_block_alloc(ctx, sizeof(T))); }

    template <class T, class Make> std::vector<T *> many(int most, Make one)
    {
        std::vector<T *> items(static_cast<std::size_t>(below(most) + 1));
        for (T *&item : items)
            item = one();
        return items;
    }

    template <class E> E *code(int count)
    {
        E *place = make_plain<E>();
        *place = static_cast<E>(below(count));
        return place;
    }

    template <class E> std::vector<E> codes(int most, int count)
    {
        std::vector<E> items(static_cast<std::size_t>(below(most) + 1));
        for (E &item : items)
            item = static_cast<E>(below(count));
        return items;
    }

    int below(int limit) { return static_cast<int>(random() % static_cast<unsigned>(limit)); }
    bool chance(int one_in) { return below(one_in) == 0; }

    std::string *text(std::string value)
    {
        auto *place = make<std::string>(SOAP_TYPE_xsd__string);
        *place = std::move(value);
        return place;
    }

    // Letters and digits, as in keys and serial numbers.
    std::string *key(int shortest, int longest)
    {
        static const char characters[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-";
        std::string value(static_cast<std::size_t>(shortest + below(longest - shortest + 1)), 'x');
        for (char &c : value)
            c = characters[below(sizeof characters - 1)];
        return text(value);
    }

    std::string *name()
    {
        static const char *const first[] = {"Anna", "Bo",       "Charlotte", "Dmitri",
                                            "Eve",  "Frederik", "Guadalupe"};
        static const char *const last[] = {"Andersson",      "Li",   "Okonkwo",
                                           "Fernandez-Ruiz", "Mayr", "Vandenberghe"};
        return text(std::string(first[below(7)]) + ' ' + last[below(6)]);
    }

    // Words, of which few hold characters to escape; long texts sometimes have lines.
    std::string *prose(int shortest, int longest)
    {
        static const char *const words[] = {
            "the",  "system", "was",        "restarted", "after",   "a",         "power", "failure",
            "of",   "unit",   "controller", "and",       "reports", "error",     "code",  "in",
            "slot", "memory", "not",        "found",     "version", "installed", "R&D",   "x < 5"};
        const int length = shortest + below(longest - shortest + 1);
        const bool plain = !chance(4);
        const bool lines = longest > 400 && chance(3);
        std::string value;
        while (static_cast<int>(value.size()) < length) {
            if (!value.empty())
                value += lines && chance(15) ? '\n' : ' ';
            value += words[below(plain ? 22 : 24)];
        }
        return text(value);
    }

    std::string *number(int limit) { return text(std::to_string(1 + below(limit))); }

    std::string *date_time()
    {
        const auto two = [&](int limit) { return std::to_string(10 + below(limit)); };
        return text("20" + two(15) + '-' + two(3) + '-' + two(18) + 'T' + two(14) + ':' + two(50) + ':' +
                    two(50) + 'Z');
    }

    std::string *uri() { return text("http://service.example/reports/" + *key(8, 24)); }

    protocol__Identity *identity(bool nests)
    {
        auto *made = make<protocol__Identity>(SOAP_TYPE_protocol__Identity);
        made->type = code<protocol__IdentityType>(12);
        if (chance(2))
            made->uuid = key(36, 36);
        made->product = key(6, 12);
        made->productName = prose(10, 30);
        made->version = text(std::to_string(below(9)) + '.' + std::to_string(below(20)));
        if (chance(2))
            made->platform = key(4, 8);
        made->serialNumber = key(8, 16);
        made->hostName = text("host" + std::to_string(below(1000)) + ".example");
        if (chance(3))
            made->name = name();
        if (chance(2))
            made->customerNumber = {*key(7, 10), *key(7, 10)};
        made->country = text(chance(2) ? "DE" : "US");
        if (nests)
            made->identity = {identity(false)};
        return made;
    }

    protocol__Address *address()
    {
        auto *made = make<protocol__Address>(SOAP_TYPE_protocol__Address);
        made->addressType = code<protocol__AddressType>(5);
        made->localeDependentLines = prose(15, 50);
        made->city = key(4, 14);
        made->state = key(2, 2);
        made->country = text("US");
        made->postalCode = key(5, 9);
        if (chance(2))
            made->timeZone = text("UTC+1");
        return made;
    }

    protocol__Telephone *telephone()
    {
        auto *made = make<protocol__Telephone>(SOAP_TYPE_protocol__Telephone);
        made->number = key(10, 14);
        if (chance(3))
            made->extension = number(9999);
        made->type = text("office");
        return made;
    }

    protocol__Contact *contact()
    {
        auto *made = make<protocol__Contact>(SOAP_TYPE_protocol__Contact);
        made->name = name();
        made->organization = prose(10, 30);
        if (chance(2))
            made->role = prose(5, 15);
        made->address = many<protocol__Address>(2, [&] { return address(); });
        made->voice = many<protocol__Telephone>(2, [&] { return telephone(); });
        made->email = {"contact" + std::to_string(below(100000)) + "@service.example"};
        made->contactPreference = codes<protocol__ContactPreference>(2, 6);
        return made;
    }

    protocolProblemReport__ProblemReportRichNotes *notes()
    {
        auto *made = make<protocolProblemReport__ProblemReportRichNotes>(
            SOAP_TYPE_protocolProblemReport__ProblemReportRichNotes);
        made->category = prose(5, 12);
        made->dateTime = date_time();
        if (chance(2))
            made->author = identity(false);
        made->notes = prose(60, 500);
        return made;
    }

    protocolProblemReport__Action *action()
    {
        auto *update = chance(3) ? make<protocolProblemReport__Action_x002eUpdate>(
                                       SOAP_TYPE_protocolProblemReport__Action_x002eUpdate)
                                 : nullptr;
        protocolProblemReport__Action *made =
            update ? update : make<protocolProblemReport__Action>(SOAP_TYPE_protocolProblemReport__Action);
        made->description = prose(30, 150);
        made->actionDateTime = date_time();
        made->timing = code<protocolProblemReport__ActionTiming>(3);
        made->intention = codes<protocolProblemReport__ActionIntention>(2, 6);
        made->result = codes<protocolProblemReport__ActionResult>(2, 9);
        made->originator = name();
        if (chance(2))
            made->notes = prose(20, 120);
        if (update)
            update->updateInformation =
                many<protocolProblemReport__UpdateInformation>(3, [&] { return update_information(); });
        return made;
    }

    protocolProblemReport__UpdateInformation *update_information()
    {
        auto *made = make<protocolProblemReport__UpdateInformation>(
            SOAP_TYPE_protocolProblemReport__UpdateInformation);
        made->product = key(6, 12);
        made->updateId = key(8, 14);
        made->updateIdQualifier = key(2, 6);
        made->confidence = number(100);
        return made;
    }

    soap *ctx;
    std::mt19937 random{20070401};
};

} // namespace

protocolProblemReport__ProblemReportContent *make_document(soap *owner, std::size_t bytes)
{
    document_maker maker(owner);
    report_class *document = maker.outer();
    const std::size_t rest = bytes > FRAME_BYTES ? bytes - FRAME_BYTES : 0;
    for (std::size_t i = 0; i < (rest + NESTED_REPORT_BYTES / 2) / NESTED_REPORT_BYTES; ++i)
        document->problemReport.push_back(maker.nested());
    return document;
}
