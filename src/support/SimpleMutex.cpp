#include "support/SimpleMutex.h"

#include <system_error>

SimpleMutex::SimpleMutex() {
    const int error = zolt::init_recursive_mutex(&mutex);
    if (error != 0) {
        throw std::system_error(error, std::generic_category(), "SimpleMutex");
    }
}

SimpleMutex::~SimpleMutex() {
    pthread_mutex_destroy(&mutex);
}
