// disk_test.cpp - the service when its disk takes no more, or another holds its database: a fault, a line in
// the log, and it goes on.
#include <filesystem>
#include <string>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/resource.h>
#include <unistd.h>

#include <zuv_client_pro/StatusReportSoapBindingProxy.h>

#include "service/port_client.h"
#include "service/raw_client.h"

using namespace service_test;

namespace {

const char *const CREATE = "<protocolProfile:createRequest/>";

// What the service, which inherits it, writes to standard error.
class log_pipe {
public:
    log_pipe() : own_(dup(STDERR_FILENO))
    {
        EXPECT_EQ(pipe2(ends_, O_CLOEXEC | O_NONBLOCK), 0);
        dup2(ends_[1], STDERR_FILENO);
    }
    ~log_pipe()
    {
        give_back();
        close(ends_[0]);
        close(ends_[1]);
    }
    log_pipe(const log_pipe &) = delete;
    log_pipe &operator=(const log_pipe &) = delete;

    // Once the service has it, this program's own messages go where they belong.
    void give_back()
    {
        if (own_ < 0)
            return;
        dup2(own_, STDERR_FILENO);
        close(own_);
        own_ = -1;
    }
    std::string take()
    {
        char text[4096];
        const ssize_t length = read(ends_[0], text, sizeof text);
        return {text, length < 0 ? 0 : static_cast<std::size_t>(length)};
    }

private:
    int own_, ends_[2];
};

class Disk : public testing::Test {
protected:
    Disk() : service_({"--database", database_, "--trace", scratch_.file("trace")}) { log_.give_back(); }

    raw_answer create() const { return exchange(service_.port(), post("Profile", soap11(CREATE))); }
    // It writes nothing.
    raw_answer get(const std::string &uri) const
    {
        return exchange(service_.port(),
                        post("Profile", soap11("<protocolProfile:getRequest/>",
                                               "<protocol:targetURI>" + uri + "</protocol:targetURI>")));
    }
    // `done` is what a request that has to write to the disk was answered.
    void expect_failure(const raw_answer &done, const char *logged)
    {
        EXPECT_EQ(done.status, 500);
        EXPECT_NE(done.body.find("Server.Processing"), std::string::npos) << done.body;
        EXPECT_NE(log_.take().find(logged), std::string::npos);
    }
    void limit_files(rlim_t bytes) const
    {
        const rlimit limit{bytes, RLIM_INFINITY};
        ASSERT_EQ(prlimit(service_.pid(), RLIMIT_FSIZE, &limit, nullptr), 0);
    }

    log_pipe log_;
    scratch_directory scratch_;
    std::string database_ = scratch_.file("documents.db");
    service_process service_;
};

} // namespace

TEST_F(Disk, a_full_one_refuses_what_has_to_be_written)
{
    port_client<StatusReportSoapBindingProxy> client(service_, "StatusReport");
    protocolStatusReport__StatusReportContent report;
    const auto *const created = client.call(&StatusReportSoapBindingProxy::create, report);
    ASSERT_NE(created, nullptr);
    const std::string uri = created->thisURI.at(0);
    _protocolStatusReport__attachRequest request;
    protocol__Attachment attachment;
    protocol__DataPortPreference preference;
    preference.transport = {protocol__Transport::HTTP};
    request.attachment = &attachment;
    request.dataPortPreference = &preference;
    const auto *const attached = client.call(&StatusReportSoapBindingProxy::attach, request, uri);
    ASSERT_NE(attached, nullptr);
    const std::string &url = *attached->attachment.at(0)->dataPort.at(0)->dataURI;
    const std::string data = "POST " + url.substr(url.find('/', url.find("://") + 3)) +
                             " HTTP/1.1\r\nContent-Length: 6\r\n\r\nsignal";
    const std::string profile = element_text(create().body, "thisURI");

    limit_files(0);
    expect_failure(create(), "database: ");
    EXPECT_EQ(exchange(service_.port(), data).status, 500);
    EXPECT_NE(log_.take().find("arriving-"), std::string::npos);
    EXPECT_EQ(get(profile).status, 200);

    limit_files(RLIM_INFINITY);
    EXPECT_EQ(create().status, 200);
    EXPECT_EQ(exchange(service_.port(), data).status, 200);
    EXPECT_EQ(service_.stop(), 0);
}

TEST_F(Disk, a_locked_database_can_be_read)
{
    const std::string profile = element_text(create().body, "thisURI");
    sqlite3 *other = nullptr;
    ASSERT_EQ(sqlite3_open(database_.c_str(), &other), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
    EXPECT_EQ(get(profile).status, 200);
    expect_failure(create(), "database is locked");
    EXPECT_EQ(sqlite3_exec(other, "ROLLBACK", nullptr, nullptr, nullptr), SQLITE_OK);
    sqlite3_close(other);
    EXPECT_EQ(create().status, 200);
    EXPECT_EQ(service_.stop(), 0);
}
