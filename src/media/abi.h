#pragma once

// What the host interfaces need so that hosts of another compiler can use them.
//
// Host and library share no code, only objects, and call each other through the objects' tables of
// virtual operations. On Linux every compiler lays those out alike (Itanium C++ ABI). On Windows
// the host's compiler follows the Microsoft C++ ABI, and a library built with MinGW follows the
// Itanium one all the same. The two agree on classes with single inheritance whose operations are
// neither overloaded nor destructors, and on the calling conventions of x86 and x86-64 where
// nothing is returned as a class. They differ in three things:
//
// - A virtual destructor is two slots (destroy; destroy and free) in the Itanium ABI, and in the
//   Microsoft ABI one that takes flags and returns the object: bit 0 asks it to free the object,
//   too. With MinGW it is therefore declared as an ordinary operation of that form, by the two
//   macros below. The C++ destructor is then not virtual, so `delete` does not work through the
//   interface, and does not compile: our own code deletes through zolt::Delete everywhere.
// - A base without data and operations stands at the start of the object in the Itanium ABI and
//   behind the pointer to the table in the Microsoft ABI. An interface derived from
//   zolt::EmptyInterface stands at the latter place with MinGW, too, so that casts agree.
// - Overloaded virtual operations stand in the order of their declaration in the Itanium ABI, and
//   are put side by side, the last one first, in the Microsoft ABI. Interfaces do without them:
//   each operation has a name of its own.
//
// Nothing else in the sources may depend on which of the ABIs is the compiler's.

#if defined(_WIN32) && !defined(_MSC_VER)

#define ZOLT_INTERFACE_DESTRUCTOR(Class)                  \
    virtual void* DeletingDestructor(unsigned flags) = 0; \
                                                          \
protected:                                                \
    ~Class()

#define ZOLT_DESTRUCTOR(Class)                         \
    virtual void* DeletingDestructor(unsigned flags) { \
        return zolt::destroy(this, flags);             \
    }                                                  \
    ~Class()

namespace zolt {

constexpr unsigned kFreeObject = 1;  // a flag

template <class Class>
void* destroy(Class* object, unsigned flags) {
    object->Class::~Class();
    if ((flags & kFreeObject) != 0) {
        ::operator delete(object);
    }
    return object;
}

struct Delete {
    template <class Interface>
    void operator()(Interface* object) const {
        if (object != nullptr) {
            object->DeletingDestructor(kFreeObject);
        }
    }
};

template <class Interface>
class EmptyInterface {
    // What moves the base. Only constructors touch it: the host's objects do not have it.
    [[maybe_unused]] char place = 0;
};

}  // namespace zolt

#else

// Declares the virtual destructor of an interface that hosts delete through, where it stands among
// the slots: `ZOLT_INTERFACE_DESTRUCTOR(IThing) = default;`, in the last line of the class.
#define ZOLT_INTERFACE_DESTRUCTOR(Class) virtual ~Class()

// Declares the destructor of a class whose objects are deleted so. Each that derives from such an
// interface needs it.
#define ZOLT_DESTRUCTOR(Class) virtual ~Class()

namespace zolt {

// Deletes an object through an interface as its own library does; for std::unique_ptr, too.
struct Delete {
    template <class Interface>
    void operator()(Interface* object) const {
        delete object;
    }
};

// Base of an interface that has no operations and is derived from by one that has. The argument is
// the interface itself, so that no two of them share a base.
template <class Interface>
class EmptyInterface {};

}  // namespace zolt

#endif
