#pragma once

#include <string>
#include <vector>

#include "zoltenc/PictureRecord.h"
#include "zoltenc/RunSummary.h"
#include "zoltenc/report/ReportPicture.h"

namespace zolt {

// What a run did, as one HTML page that needs nothing else, below 3 MB however long the stream is.
class ReportPage {
public:
    // The arguments are the caller's and outlive the page.
    ReportPage(const RunSummary& summary, const std::vector<PictureRecord>& records,
               const std::vector<ReportPicture>& pictures)
        : summary_(summary), records_(records), pictures_(pictures) {}

    std::string html() const;

private:
    std::string tiles() const;
    std::string settings() const;
    std::string plots() const;
    std::string pictures() const;

    const RunSummary& summary_;
    const std::vector<PictureRecord>& records_;
    const std::vector<ReportPicture>& pictures_;
};

}  // namespace zolt
