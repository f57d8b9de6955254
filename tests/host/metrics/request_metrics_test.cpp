// SPDX-License-Identifier: Apache-2.0
#include "host/metrics/request_metrics.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <string>

namespace {

using host::RequestKind;
using host::RequestMetrics;
using host::RequestOutcome;
using std::chrono::milliseconds;
using ::testing::AllOf;
using ::testing::HasSubstr;

TEST(RequestMetrics, CountByKindAndOutcome) {
    RequestMetrics metrics;
    for (int count = 0; count < 3; ++count) {
        metrics.begin(RequestKind::read, 10);
        metrics.end(RequestKind::read, RequestOutcome::success, 1000, milliseconds(1));
    }
    metrics.begin(RequestKind::write, 500);
    metrics.end(RequestKind::write, RequestOutcome::failure, 5, milliseconds(1));
    metrics.begin(RequestKind::write, 7);
    metrics.end(RequestKind::write, RequestOutcome::noAnswer, 0, milliseconds(1));
    EXPECT_THAT(
        metrics.text(),
        AllOf(HasSubstr("\neditor_requests_total{kind=\"read\",outcome=\"success\"} 3\n"),
              HasSubstr("\neditor_requests_total{kind=\"read\",outcome=\"failure\"} 0\n"),
              HasSubstr("\neditor_requests_total{kind=\"write\",outcome=\"failure\"} 1\n"),
              HasSubstr("\neditor_requests_total{kind=\"write\",outcome=\"no_answer\"} 1\n"),
              HasSubstr("\neditor_request_bytes_total{kind=\"read\"} 30\n"),
              HasSubstr("\neditor_request_bytes_total{kind=\"write\"} 507\n"),
              HasSubstr("\neditor_answer_bytes_total{kind=\"read\"} 3000\n")));
}

TEST(RequestMetrics, KnowWhatIsUnderWay) {
    RequestMetrics metrics;
    metrics.begin(RequestKind::read, 1);
    metrics.begin(RequestKind::read, 1);
    metrics.end(RequestKind::read, RequestOutcome::success, 1, milliseconds(1));
    EXPECT_THAT(metrics.text(),
                AllOf(HasSubstr("\neditor_requests_under_way{kind=\"read\"} 1\n"),
                      HasSubstr("\neditor_requests_under_way{kind=\"write\"} 0\n")));
}

TEST(RequestMetrics, PutDurationsIntoBucketsThatIncludeTheSmallerOnes) {
    RequestMetrics metrics;
    for (const milliseconds duration :
         {milliseconds(1), milliseconds(2), milliseconds(250), milliseconds(60'000)}) {
        metrics.begin(RequestKind::write, 0);
        metrics.end(RequestKind::write, RequestOutcome::success, 0, duration);
    }
    const std::string bucket = "\neditor_request_seconds_bucket{kind=\"write\",le=";
    EXPECT_THAT(metrics.text(),
                AllOf(HasSubstr(bucket + "\"0.001\"} 1\n"), HasSubstr(bucket + "\"0.003\"} 2\n"),
                      HasSubstr(bucket + "\"0.1\"} 2\n"), HasSubstr(bucket + "\"0.3\"} 3\n"),
                      HasSubstr(bucket + "\"10\"} 3\n"), HasSubstr(bucket + "\"+Inf\"} 4\n"),
                      HasSubstr("\neditor_request_seconds_sum{kind=\"write\"} 60.253\n"),
                      HasSubstr("\neditor_request_seconds_count{kind=\"write\"} 4\n")));
}

}  // namespace
