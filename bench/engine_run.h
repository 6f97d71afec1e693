// engine_run.h - what a call does with its message and its answer, without a network: the work that is
// measured.
#pragma once

#include <string>

#include <zuv_client_pro/protocolProblemReport.h>

// Context whose sent bytes are dropped, or kept for a look, and whose received bytes come from memory.
class engine_run : public soap {
public:
    engine_run();

    // Marks, counts and sends a message with the report. The bytes sent; 0 on a failure.
    std::size_t write(const protocolProblemReport__ProblemReportContent &report);

    // The same, with the bytes kept.
    std::string written(const protocolProblemReport__ProblemReportContent &report);

    // Reads a message. The report lives until release; null on a failure.
    protocolProblemReport__ProblemReportContent *read(const std::string &message);
    void release();

private:
    static int take(soap *ctx, const char *data, std::size_t length);
    static std::size_t give(soap *ctx, char *buffer, std::size_t length);

    std::size_t sent = 0;
    std::string *kept = nullptr;
    const char *unread = nullptr;
    std::size_t unread_length = 0;
};
