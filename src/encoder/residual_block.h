#pragma once

#include <cstdint>

#include "encoder/BitCursor.h"
#include "encoder/cavlc_tables.h"

namespace zolt {

// Writes the block of `count` levels in scan order (16, 15 or, chroma DC only, 4) of which those in
// the mask are not 0 (bit n: position n; at least one): residual_block_cavlc(), clauses 7.3.5.3.2
// and 9.2. Returns their number, TotalCoeff. The cursor is flushed, before and after.
int put_levels_of_block(BitCursor& cursor, const std::int16_t* levels, unsigned nonzero, int count,
                        unsigned token_class);

// The same for any block.
inline int encodeCAVLCBlock4x4(BitCursor& cursor, const std::int16_t* levels, unsigned nonzero,
                               int count, unsigned token_class) {
    if (nonzero != 0) {
        return put_levels_of_block(cursor, levels, nonzero, count, token_class);
    }
    const CodeWord token = cavlc_tables.coeff_token[token_class][0][0];
    cursor.put(token.bits, token.length);
    cursor.flush();
    return 0;
}

}  // namespace zolt
