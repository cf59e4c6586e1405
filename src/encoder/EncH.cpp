#include "encoder/EncH.h"

#include "encoder/CEncoder.h"

CEncH::CEncH(int width, int height) : encoder(new CEncoder(width, height)) {}

CEncH::~CEncH() {
    delete encoder;
}
