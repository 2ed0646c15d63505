// The interface of a data set's components.

#ifndef KELVANE_DATASET_ORV_DATASET_COMPONENT_H_
#define KELVANE_DATASET_ORV_DATASET_COMPONENT_H_

#include <string>

namespace kelvane {

// One kind of data of a data set, with the store's fixed link to it. Immutable once constructed.
//
// There is no virtual destructor, and none that a user could call. So a handle to a component must
// know the concrete type: make it with std::make_shared of that type, then convert it.
class orv_dataset_component {
 public:
  orv_dataset_component(const orv_dataset_component&) = delete;
  orv_dataset_component& operator=(const orv_dataset_component&) = delete;

  // Whether this component can stand in for `other`.
  virtual bool compatible_schema(const orv_dataset_component& other) const = 0;

  // Makes the store's link of this kind select this component's data: removes the old link, then
  // creates the new one, if this component needs one. A link that cannot be removed is warned about
  // and no more. Throws the int error number of a link that cannot be created, after its warning;
  // the old link is gone then, unless it could not be removed.
  virtual void activate() const = 0;

 protected:
  explicit orv_dataset_component(const std::string& directory) : dataset_path(directory) {}
  ~orv_dataset_component() = default;

  // The data set's directory as given; empty for the system partition.
  const std::string dataset_path;
};

}  // namespace kelvane

#endif  // KELVANE_DATASET_ORV_DATASET_COMPONENT_H_
