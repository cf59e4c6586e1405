#include "kernels/families.h"

#if defined(__x86_64__) || defined(__i386__)
#define ZOLT_X86 1
#endif

namespace zolt {
namespace {

// The tables, each a copy of the one before it with the entries replaced that its instruction set
// has faster kernels for.
class Tables {
public:
    Tables() {
        scalar::fill_search(add("scalar"));
        scalar::fill_prediction(last());
        scalar::fill_residual(last());
        scalar::fill_intra(last());
        scalar::fill_deblock(last());
        scalar::fill_color(last());
#ifdef ZOLT_X86
        __builtin_cpu_init();
        if (__builtin_cpu_supports("sse2")) {
            sse2::fill_search(add("sse2"));
            sse2::fill_prediction(last());
            sse2::fill_residual(last());
            sse2::fill_intra(last());
            sse2::fill_deblock(last());
            sse2::fill_color(last());
        }
        if (__builtin_cpu_supports("avx2")) {
            avx2::fill_search(add("avx2"));
            avx2::fill_prediction(last());
            avx2::fill_residual(last());
            avx2::fill_intra(last());
            avx2::fill_intra4(last());
            avx2::fill_deblock(last());
            avx2::fill_color(last());
        }
        // Processors with VBMI do not lower their clock for 512-bit vectors as older ones do.
        if (__builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512vl") &&
            __builtin_cpu_supports("avx512dq") && __builtin_cpu_supports("avx512vbmi")) {
            avx512::fill_search(add("avx512"));
            avx512::fill_prediction(last());
            avx512::fill_residual(last());
            avx512::fill_intra4(last());
        }
#endif
    }

    KernelTables all() const {
        return {m_table, m_table + m_count};
    }

private:
    Kernels& add(const char* name) {
        if (m_count > 0) {
            m_table[m_count] = last();
        }
        ++m_count;
        last().name = name;
        return last();
    }
    Kernels& last() {
        return m_table[m_count - 1];
    }

    Kernels m_table[4] = {};
    int m_count = 0;
};

}  // namespace

KernelTables kernel_tables() {
    static const Tables tables;
    return tables.all();
}

const Kernels& scalar_kernels() {
    return *kernel_tables().begin();
}

const Kernels& best_kernels() {
    return *(kernel_tables().end() - 1);
}

}  // namespace zolt
