// A reference to a service. It is never null and can be set to another service.
#pragma once

namespace tavrel {

template <class Service>
class ServiceReference {
 public:
  // NOLINTNEXTLINE(google-explicit-constructor): a bundle is filled from the services themselves.
  ServiceReference(Service& service) : service_(&service) {}

  Service* operator->() const { return service_; }
  // NOLINTNEXTLINE(google-explicit-constructor): operations take the plain reference.
  operator Service&() const { return *service_; }

 private:
  Service* service_;
};

}  // namespace tavrel
