# What every file is compiled and linked with for Windows. The options are the same for all, because a
# link with interprocedural optimisation has one set of assembler options.

# Nothing but the system's libraries is needed at run time.
add_link_options(-static)

# Windows Vista's interfaces; no macros named min and max.
add_compile_definitions(_WIN32_WINNT=0x0600 NOMINMAX WIN32_LEAN_AND_MEAN)

if(CMAKE_SIZEOF_VOID_P EQUAL 8)
    # The system aligns the stack to 16 bytes and g++ cannot align a frame further there, yet as it is
    # published it keeps vectors of 32 and 64 bytes there with instructions that fault on any other
    # alignment. Debian's compilers write the unaligned form; with this the assembler does for all,
    # and for what is aligned by hand. It is as fast on processors that have AVX.
    add_compile_options(-Wa,-muse-unaligned-vector-move)
    add_link_options(-Wa,-muse-unaligned-vector-move)
endif()
