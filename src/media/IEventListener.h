#pragma once

// A host event. Opaque: this system only passes it on.
class IEvent;

// Something that host events can be sent to.
//
// Like every host interface it has pure operations only, and their order is the order of the slots
// through which the host calls; implementations may add operations behind them, never between.
// Interfaces without a virtual destructor cannot be deleted through.
class IEventListener {
public:
    virtual void Notify(IEvent* event) = 0;

protected:
    ~IEventListener() = default;
};
