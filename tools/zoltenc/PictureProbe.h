#pragma once

#include <vector>

#include "io/PictureSink.h"
#include "zoltenc/PictureRecord.h"
#include "zoltenc/report/ReportPicture.h"

namespace zolt {

// Looks at pictures as a player shows them: decodes the stream while it is coded.
class PictureProbe {
public:
    virtual ~PictureProbe() = default;

    // The bare parameter sets of the pictures that follow.
    virtual void begin(const std::vector<unsigned char>& seq_par_set,
                       const std::vector<unsigned char>& pic_par_set) = 0;

    // Decodes the next picture and sets the record's quality. `source` is the picture that the
    // session was given. Throws a ToolError when the picture cannot be decoded.
    virtual void look(const unsigned char* source, const CodedPicture& picture,
                      PictureRecord& record) = 0;

    // Those of the pictures so far that a report shows, in their order; none unless the probe was
    // opened for it.
    virtual std::vector<ReportPicture> pictures() = 0;
};

}  // namespace zolt
