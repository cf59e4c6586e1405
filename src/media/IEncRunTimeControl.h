#pragma once

// What can be asked of an encoder while it runs.
class IEncRunTimeControl {
public:
    virtual bool SupportsChangingBitRate() = 0;
    // Asks for a bit rate in kbit/s; returns the rate in force.
    virtual int ChangeBitRateKbs(int kbs) = 0;

protected:
    ~IEncRunTimeControl() = default;
};

// What can be asked of a video encoder while it runs.
class IVideoEncRunTimeControl : public IEncRunTimeControl {
public:
    virtual void ForceIntraFrame() = 0;
    virtual bool SupportsProducingExtraIntraFrame() = 0;
    virtual void ProduceExtraIntraFrame() = 0;

protected:
    ~IVideoEncRunTimeControl() = default;
};
