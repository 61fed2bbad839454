// EngineV2: the carried Engine's load cycle with the ResourceRegisterV2
// callbacks, and the certificate synchronisation.
#include <tavow3/engine_v2.h>

#include <boost/bind/bind.hpp>
#include <boost/make_shared.hpp>

#include "engine/crt_sync.h"
#include "engine/engine_private.h"
#include "engine/engine_v2_private.h"

namespace tavow3 {

EngineV2::EngineV2() : EngineV2(Engine()) {}

EngineV2::EngineV2(const Engine& engine)
    : engine_(engine), security_(boost::make_shared<Security>()) {}

void EngineV2::Register(boost::function<void(Engine&)> callback) {
  AddedCallbacks().push_back(std::move(callback));
}

void EngineV2::load() { engine_.load_callback(boost::bind(&EngineV2::load_func, this)); }

void EngineV2::load_func() {
  LoadPackagePlugin();
  for (const EngineV2Callback& callback : BuiltinV2Callbacks()) callback(*this);
  // By index: a callback may register further callbacks.
  const std::vector<EngineCallback>& added = AddedCallbacks();
  for (size_t i = 0; i < added.size(); ++i) added[i](engine_);
}

bool EngineV2::W3SyncCrtInfo() {
  load();
  return SyncCertificates(*security_);
}

int EngineV2::W3FwReGenAll() { return engine_.W3FwReGenAll(); }

bool RegisterCrtResource(EngineV2& engine, const CrtResource& resource) {
  engine.load();
  return engine.security()
      .crt_resources.emplace(EngineV2::CrtKey(resource.subscriber, resource.service), resource)
      .second;
}

void RegisterPackageSubscriber(EngineV2& engine, const std::string& subscriber) {
  engine.load();
  engine.security().package_subscribers.insert(subscriber);
}

}  // namespace tavow3
