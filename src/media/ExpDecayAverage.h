#pragma once

// Exponentially decaying average of a series of values.
class ExpDecayAverage {
public:
    ExpDecayAverage() : ExpDecayAverage(0.98) {}
    // `decayFactor` is the weight of the average so far, the rest that of the newest value.
    explicit ExpDecayAverage(double decayFactor) : decay(decayFactor) {}
    // The newest value weighs 1/n; n below 1 counts as 1.
    explicit ExpDecayAverage(int n) : ExpDecayAverage(1.0 - 1.0 / (n < 1 ? 1 : n)) {}
    virtual ~ExpDecayAverage() = default;

    // Takes in x and returns the new average; the first value is the average.
    double Update(double x);
    // Forgets every value.
    void Reset();

private:
    double decay;
    double average = 0.0;
    bool first = true;
};
