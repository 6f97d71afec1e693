// report_ports_test.cpp - status, inventory and problem reports, and the data that belongs to them, beside
// the walk through all operations, which tests/interop takes.
#include <string>

#include <gtest/gtest.h>

#include <zuv_client_pro/StatusReportSoapBindingProxy.h>

#include "service/port_client.h"
#include "service/raw_client.h"

using namespace service_test;

namespace {

using status_proxy = StatusReportSoapBindingProxy;
using status_state = protocolStatusReport__StatusReportState;

// Where on the service a URL leads.
std::string path_of(const std::string &url)
{
    return url.substr(url.find('/', url.find("://") + 3));
}

} // namespace

TEST(StatusReport, StaysAsItEnded)
{
    service_process service;
    port_client<status_proxy> client(service, "StatusReport");
    protocolStatusReport__StatusReportContent report;
    const std::string uri = client.call(&status_proxy::create, report)->thisURI.at(0);
    _protocolStatusReport__closeRequest close;
    ASSERT_NE(client.call(&status_proxy::close, close, uri), nullptr);
    _protocolStatusReport__cancelRequest cancel;
    EXPECT_EQ(client.call(&status_proxy::cancel, cancel, uri), nullptr);
    EXPECT_NE(client.detail().Client_x002eInvalidRequest, nullptr);
    EXPECT_EQ(client.call(&status_proxy::submit, report, uri), nullptr);
    _protocolStatusReport__getRequest get;
    EXPECT_EQ(*client.call(&status_proxy::get, get, uri)->state, status_state::closed);
}

TEST(StatusReport, TakesDataThroughADataPortAndNotesHowItGoes)
{
    service_process service;
    port_client<status_proxy> client(service, "StatusReport");
    protocolStatusReport__StatusReportContent report;
    const std::string uri = client.call(&status_proxy::create, report)->thisURI.at(0);
    _protocolStatusReport__attachRequest request;
    protocol__Attachment attachment;
    protocol__DataPortPreference wish;
    wish.transport = {protocol__Transport::FTP, protocol__Transport::HTTP};
    request.attachment = &attachment;
    request.dataPortPreference = &wish;
    const auto *attached = client.call(&status_proxy::attach, request, uri);
    ASSERT_NE(attached, nullptr);
    const protocol__DataPort &port = *attached->attachment.at(0)->dataPort.at(0);
    EXPECT_EQ(*port.transport, protocol__Transport::HTTP);

    // The bytes go to the data port as they are, in one piece or in chunks.
    const std::string path = path_of(*port.dataURI), bytes("\0<binary>\r\n\xFF", 12);
    const auto send = [&](const std::string &where, const std::string &rest) {
        return exchange(service.port(), "POST " + where + " HTTP/1.1\r\n" + rest).status;
    };
    const auto kept = [&] { return exchange(service.port(), "GET " + path + " HTTP/1.1\r\n\r\n").body; };
    EXPECT_EQ(send(path, "Content-Length: 12\r\n\r\n" + bytes), 200);
    EXPECT_EQ(kept(), bytes);
    EXPECT_EQ(send(path, "Transfer-Encoding: chunked\r\n\r\n3\r\nabc\r\n2\r\nde\r\n0\r\n\r\n"), 200);
    EXPECT_EQ(kept(), "abcde");
    EXPECT_EQ(send(path + "x", "Content-Length: 1\r\n\r\nx"), 404);

    protocol__AttachStatusRequest progress;
    double percent = 40;
    bool problem = true;
    std::string attachment_uri = *port.attachmentURI;
    protocol__AttachmentState recommended = protocol__AttachmentState::error;
    progress.attachmentURI = &attachment_uri;
    progress.percentComplete = &percent;
    const auto noted = [&]() -> const protocol__Attachment & {
        return *client.call(&status_proxy::attachStatus, progress, uri)->attachment.at(0);
    };
    EXPECT_EQ(*noted().state, protocol__AttachmentState::pending);
    percent = 100;
    EXPECT_EQ(*noted().dataPort.at(0)->state, protocol__DataPortState::closed);
    progress.recommendedAttachmentState = &recommended;
    progress.problemEncountered = &problem;
    EXPECT_EQ(*noted().state, protocol__AttachmentState::error);
    EXPECT_NE(noted().error, nullptr);
    attachment_uri = "urn:nothing";
    EXPECT_EQ(client.call(&status_proxy::attachStatus, progress, uri), nullptr);
    EXPECT_NE(client.detail().Client_x002eObjectNotFound, nullptr);
    progress.attachmentURI = nullptr;
    EXPECT_EQ(client.call(&status_proxy::attachStatus, progress, uri), nullptr);
    EXPECT_NE(client.detail().Client_x002eInsufficientInformation, nullptr);
}

TEST(StatusReport, RefusesDataPortsThatItDoesNotHave)
{
    service_process service;
    port_client<status_proxy> client(service, "StatusReport");
    protocolStatusReport__StatusReportContent report;
    const std::string uri = client.call(&status_proxy::create, report)->thisURI.at(0);
    protocol__Attachment attachment;
    protocol__URITypePreference indirect = protocol__URITypePreference::indirect;
    protocol__DataPortPreference wishes[4];
    wishes[0].transport = {protocol__Transport::FTP};
    wishes[1].direction = {protocol__Direction::out};
    wishes[2].authentication = {protocol__Authentication::private_};
    wishes[3].dataURIType = &indirect;
    for (protocol__DataPortPreference &wish : wishes) {
        _protocolStatusReport__attachRequest request;
        request.attachment = &attachment;
        request.dataPortPreference = &wish;
        EXPECT_EQ(client.call(&status_proxy::attach, request, uri), nullptr);
        const auto *const fault = client.detail().Client_x002eDataPortIncompatibility;
        ASSERT_NE(fault, nullptr);
        EXPECT_EQ(fault->direction, std::vector{protocol__Direction::in});
        EXPECT_EQ(fault->transport, std::vector{protocol__Transport::HTTP});
        EXPECT_EQ(fault->authentication, std::vector{protocol__Authentication::anonymous});
    }
    protocol__Data data;
    data.value = "inline";
    attachment.data = &data;
    _protocolStatusReport__attachRequest request;
    request.attachment = &attachment;
    request.dataPortPreference = &wishes[0];
    const auto *attached = client.call(&status_proxy::attach, request, uri);
    ASSERT_NE(attached, nullptr)
        << "data that is there needs no port, and nothing of the refused ones was kept";
    ASSERT_EQ(attached->attachment.size(), 1u);
    EXPECT_EQ(*attached->attachment.at(0)->state, protocol__AttachmentState::complete);
    EXPECT_TRUE(attached->attachment.at(0)->dataPort.empty());
}

// The problem report port has no proxy: its messages are written by hand.
TEST(ProblemReport, IsAnsweredAtOnceByWhatItsWordsSay)
{
    service_process service;
    const auto submit = [&](const std::string &title, const std::string &description) {
        return exchange(
            service.port(),
            post(
                "ProblemReport",
                soap11("<protocolProblemReport:submitRequest><protocolProblemReport:title>" + title +
                       "</protocolProblemReport:title><protocolProblemReport:problemDescription>" +
                       description +
                       "</protocolProblemReport:problemDescription></protocolProblemReport:submitRequest>")));
    };
    const std::string action = "xsi:type=\"protocolProblemReport:Action.Update.Install\"";
    raw_answer answer = submit("Heavy load", "Under it the controller hangs.");
    ASSERT_EQ(answer.status, 200) << answer.body;
    EXPECT_NE(answer.body.find(action), std::string::npos);
    EXPECT_EQ(element_text(answer.body, "updateId"), "FW-120");
    EXPECT_FALSE(element_text(answer.body, "submitDateTime").empty());
    answer = submit("Question", "Is DRV-5 of use to me?");
    EXPECT_EQ(element_text(answer.body, "updateId"), "DRV-5");
    EXPECT_EQ(element_text(answer.body, "confidence"), "90");
    answer = submit("Coffee", "It is cold.");
    EXPECT_EQ(answer.body.find(action), std::string::npos);
}
