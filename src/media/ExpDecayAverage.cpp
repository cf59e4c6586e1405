#include "media/ExpDecayAverage.h"

double ExpDecayAverage::Update(double x) {
    average = first ? x : decay * average + (1.0 - decay) * x;
    first = false;
    return average;
}

void ExpDecayAverage::Reset() {
    average = 0.0;
    first = true;
}
