// A library with one of the functions that the loader's tests ask for.
extern "C" [[gnu::visibility("default")]] int first_function() {
    return -1;
}
