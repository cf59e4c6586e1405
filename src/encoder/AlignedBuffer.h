#pragma once

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <new>
#include <type_traits>

namespace zolt {

// Owning, zero-filled array of trivially copyable elements whose start is aligned to 64 bytes.
// It stands for its address wherever a pointer does. It never throws: the address is null before
// allocate() and after one that failed.
template <typename T>
class AlignedBuffer {
    static_assert(std::is_trivially_copyable<T>::value, "elements are copied and cleared as bytes");

public:
    static constexpr std::size_t kAlignment = 64;

    AlignedBuffer() = default;
    AlignedBuffer(const AlignedBuffer&) = delete;
    AlignedBuffer& operator=(const AlignedBuffer&) = delete;
    ~AlignedBuffer() { release(); }

    // Replaces the content by `count` zero elements; returns false on failure.
    bool allocate(std::size_t count) {
        release();
        const std::size_t bytes = (count * sizeof(T) + kAlignment - 1) / kAlignment * kAlignment;
        m_data = static_cast<T*>(::operator new(bytes, std::align_val_t(kAlignment), std::nothrow));
        if (m_data) {
            std::memset(static_cast<void*>(m_data), 0, bytes);
        }
        return m_data != nullptr;
    }

    void release() {
        ::operator delete(m_data, std::align_val_t(kAlignment));
        m_data = nullptr;
    }

    T* data() const { return m_data; }
    operator T*() const { return m_data; }
    T* operator->() const { return m_data; }

private:
    T* m_data = nullptr;
};

}  // namespace zolt
