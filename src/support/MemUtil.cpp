#include "support/MemUtil.h"

#include <algorithm>
#include <memory>
#include <vector>

namespace {

template <class T>
int check_size_array(T** array, int* size, int needed) {
    if (*size >= needed) {
        return 0;
    }
    delete[] * array;
    *array = nullptr;
    *size = 0;
    *array = new T[static_cast<size_t>(needed)];
    *size = needed;
    return 1;
}

template <class T>
T** create_two_dim_array(int rows, int cols) {
    const auto row_count = static_cast<size_t>(std::max(rows, 0));
    const auto row_size = static_cast<size_t>(std::max(cols, 0));
    std::vector<std::unique_ptr<T[]>> owned(row_count);
    for (auto& row : owned) {
        row = std::make_unique<T[]>(row_size);
    }
    T** array = new T*[row_count];
    std::transform(owned.begin(), owned.end(), array,
                   [](std::unique_ptr<T[]>& row) { return row.release(); });
    return array;
}

template <class T>
void delete_two_dim_array(T*** a, int rows) {
    if (*a == nullptr) {
        return;
    }
    for (int row = 0; row < rows; row++) {
        delete[](*a)[row];
    }
    delete[] * a;
    *a = nullptr;
}

}  // namespace

int MemUtil::CheckSizeArrayByte(unsigned char** array, int* size, int needed) {
    return check_size_array(array, size, needed);
}

int MemUtil::CheckSizeArrayBool(bool** array, int* size, int needed) {
    return check_size_array(array, size, needed);
}

int MemUtil::CheckSizeArrayInt(int** array, int* size, int needed) {
    return check_size_array(array, size, needed);
}

int MemUtil::CheckSizeArrayDouble(double** array, int* size, int needed) {
    return check_size_array(array, size, needed);
}

int** MemUtil::CreateTwoDimArrayInt(int rows, int cols) {
    return create_two_dim_array<int>(rows, cols);
}

double** MemUtil::CreateTwoDimArrayDouble(int rows, int cols) {
    return create_two_dim_array<double>(rows, cols);
}

void MemUtil::DeleteTwoDimArrayInt(int*** a, int rows) {
    delete_two_dim_array(a, rows);
}

void MemUtil::DeleteTwoDimArrayDouble(double*** a, int rows) {
    delete_two_dim_array(a, rows);
}
