#include "zoltenc/PlayerHeadersSink.h"

#include "io/ToolError.h"
#include "session/player_headers.h"

namespace zolt {

void PlayerHeadersSink::begin(const StreamDescription& stream) {
    StreamDescription told = stream;
    told.seq_par_set = player_seq_par_set(stream);
    if (told.seq_par_set.empty()) {
        throw ToolError(name() +
                        ": the encoder's sequence parameter set cannot be read; "
                        "--plain-headers leaves it as it is");
    }
    SinkDecorator::begin(told);
}

}  // namespace zolt
