// A library with all the functions that the loader's tests ask for.
extern "C" {
[[gnu::visibility("default")]] int first_function() {
    return 1;
}
[[gnu::visibility("default")]] int second_function() {
    return 2;
}
}
