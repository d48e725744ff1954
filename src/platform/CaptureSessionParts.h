#pragma once

#include "base/Guarded.h"
#include "platform/CaptureSession.h"

#include <string>
#include <vector>

namespace kelvo {

/// What the capture sessions of all adapters have in common: which inputs and outputs they hold, and who
/// observes them. Thread-safe.
class CaptureSessionParts : public CaptureSession {
  public:
    bool canAddInput(const CaptureInputRef& input) override;
    void addInput(const CaptureInputRef& input) override;
    void removeInput(const CaptureInputRef& input) override;
    bool canAddOutput(const CaptureOutputRef& output) override;
    void addOutput(const CaptureOutputRef& output) override;
    void removeOutput(const CaptureOutputRef& output) override;
    void addObserver(std::weak_ptr<CaptureSessionObserver> observer, std::string_view keyPath) override;
    OptionalError removeObserver(const CaptureSessionObserver* observer, std::string_view keyPath) override;

    /// Whether a sample that waits for `output` may still be delivered.
    bool yieldsTo(const CaptureOutputRef& output);

    /// Tells the observers of `keyPath`, on the calling thread, that this property has changed.
    void notifyObservers(std::string_view keyPath);

    std::size_t inputCount() const;
    std::size_t outputCount() const;
    std::size_t observerCount() const;

  protected:
    std::vector<CaptureOutputRef> outputs() const;

    /// Called on the thread that added or removed an input or an output.
    virtual void partsChanged() {}

  private:
    struct Observation {
        std::string keyPath;
        const CaptureSessionObserver* key;
        std::weak_ptr<CaptureSessionObserver> observer;
    };
    struct Parts {
        std::vector<CaptureInputRef> inputs;
        std::vector<CaptureOutputRef> outputs;
        std::vector<Observation> observations;
    };
    Guarded<Parts> parts_;
};

}  // namespace kelvo
