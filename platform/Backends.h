// Internal: the defaults the platform registry falls back on, each supplied by the part
// of the platform layer that implements it. The registry calls these itself, the first
// time a service is asked for while no host has installed its own: an explicit call
// rather than a backend's static constructor, so start-up order does not matter and a
// static link cannot drop a backend that nothing else names.
#pragma once

#include <memory>

namespace corvel {

class MainQueueDispatcher;
class TextRecognizer;

namespace detail {

// The Tesseract engine with its default options (platform/tesseract/).
std::shared_ptr<TextRecognizer> makeDefaultTextRecognizer();
// The internal main queue that MainQueue::drain and runUntil work off
// (platform/OperationQueue.cpp); the same object on every call.
std::shared_ptr<MainQueueDispatcher> internalMainQueueDispatcher();

}  // namespace detail
}  // namespace corvel
