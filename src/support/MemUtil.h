#pragma once

// Arrays that grow on demand, and two-dimensional arrays. Everything is allocated as an array and
// belongs to the caller, who releases it as an array; std::bad_alloc is passed on with the
// arguments in a consistent state.
class MemUtil {
public:
    // Makes sure that *array holds at least `needed` elements: when *size is smaller, releases
    // *array (null is fine), allocates `needed` elements with undefined contents, records the new
    // count in *size and returns 1; otherwise returns 0.
    static int CheckSizeArrayByte(unsigned char** array, int* size, int needed);
    static int CheckSizeArrayBool(bool** array, int* size, int needed);
    static int CheckSizeArrayInt(int** array, int* size, int needed);
    static int CheckSizeArrayDouble(double** array, int* size, int needed);

    // A new array of `rows` new rows of `cols` elements each, all 0. Counts below 0 count as 0.
    static int** CreateTwoDimArrayInt(int rows, int cols);
    static double** CreateTwoDimArrayDouble(int rows, int cols);

    // Releases the `rows` rows of **a and the array itself, and sets *a to null. A null *a is fine.
    static void DeleteTwoDimArrayInt(int*** a, int rows);
    static void DeleteTwoDimArrayDouble(double*** a, int rows);
};
