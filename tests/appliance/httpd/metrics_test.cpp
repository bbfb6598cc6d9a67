// The door's figures, by themselves.

#include <gmock/gmock.h>

#include <sstream>

#include "appliance/httpd/door_metrics.h"

namespace httpd_test {
namespace {

using appliance::DoorMetrics;
using std::chrono::microseconds;

// The value of a sample; -1 when there is none.
double ValueOf(const std::string& text, const std::string& sample) {
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
        if (line.compare(0, sample.size() + 1, sample + " ") == 0) {
            return std::stod(line.substr(sample.size() + 1));
        }
    }
    return -1;
}

TEST(MetricsTest, Requests) {
    DoorMetrics metrics;
    metrics.CountRequest("GET", 200, microseconds(100));
    metrics.CountRequest("GET", 304, microseconds(100));
    metrics.CountRequest("POST", 200, microseconds(3000));
    metrics.CountRequest("POST", 401, microseconds(20000000));
    metrics.CountRequest("BREW", 405, microseconds(500));
    metrics.CountRequest("", 999, microseconds(400000000));
    const std::string text = metrics.Text(3, 2, 7);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"GET\",status=\"2xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"GET\",status=\"3xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"POST\",status=\"2xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"POST\",status=\"4xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"other\",status=\"4xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"other\",status=\"5xx\"}"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_requests_total{verb=\"HEAD\",status=\"2xx\"}"), 0);
    const std::string bucket = "vorn_httpd_request_duration_seconds_bucket";
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"0.0005\"}"), 3);
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"0.0025\"}"), 3);
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"0.005\"}"), 4);
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"30\"}"), 5);
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"300\"}"), 5);
    EXPECT_EQ(ValueOf(text, bucket + "{le=\"+Inf\"}"), 6);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_request_duration_seconds_count"), 6);
    EXPECT_DOUBLE_EQ(ValueOf(text, "vorn_httpd_request_duration_seconds_sum"), 420.0037);
}

TEST(MetricsTest, OtherFigures) {
    DoorMetrics metrics;
    metrics.CountConnection();
    metrics.CountConnection();
    metrics.CountRefusal();
    metrics.CountHandshakeFailure();
    metrics.CountUpstreamFailure();
    metrics.CountReceived(10);
    metrics.CountSent(20);
    const std::string text = metrics.Text(3, 2, 7);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_connections"), 3);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_connections_total"), 2);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_connections_refused_total"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_handshakes_failed_total"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_upstream_failures_total"), 1);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_upstream_requests"), 2);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_received_bytes_total"), 10);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_sent_bytes_total"), 20);
    EXPECT_EQ(ValueOf(text, "vorn_httpd_log_lines_lost_total"), 7);
}

TEST(MetricsTest, EveryFigureIsDescribedOnceAndLinesAreWhole) {
    const std::string text = DoorMetrics().Text(0, 0, 0);
    ASSERT_EQ(text.back(), '\n');
    std::istringstream lines(text);
    std::string described;
    for (std::string line; std::getline(lines, line);) {
        if (line.compare(0, 7, "# HELP ") == 0) {
            described = line.substr(7, line.find(' ', 7) - 7);
        } else if (line.compare(0, 7, "# TYPE ") == 0) {
            EXPECT_EQ(line.substr(7, described.size() + 1), described + " ");
        } else {
            EXPECT_EQ(line.substr(0, described.size()), described);
        }
    }
}

}  // namespace
}  // namespace httpd_test
