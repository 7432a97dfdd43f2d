// The parameters of a request, checked while they are read. Every operation answers true, or false
// with the reason in GetErr(), so that a caller reads on and on and looks once:
//
//     Parameters parameters(request.getParams());
//     Node node;
//     if (!parameters.AreOnly({"name", "port"}) || !parameters.ReadFields({"name", "port"}, node))
//     {
//         return Failure(ERR::BAD_PARAMETER, parameters.GetErr());
//     }
#ifndef NODE_REGISTRY_PARAMETERS_H
#define NODE_REGISTRY_PARAMETERS_H

#include <string>
#include <vector>

#include <json/value.h>

#include "node.h"

namespace NodeRegistry {

class Parameters {
  public:
    // `object` must outlive the reader.
    explicit Parameters(const Json::Value& object) : params(object) {}

    bool Has(const std::string& name) const;

    // Refuses parameters of other names: a misspelt filter must not list everything.
    bool AreOnly(const std::vector<std::string>& names);

    // The node by its "id", or without one by its "name".
    bool ReadKey(NodeKey& ret_key);

    // Fills the named fields of a node. All must be there; on failure some may be filled.
    bool ReadFields(const std::vector<std::string>& names, Node& node);

    // The path "file".
    bool ReadFile(std::string& ret_path);

    // The condition of a list; empty, for all nodes, without a "filter".
    bool ReadFilter(std::string& ret_condition);

    // Notes why the parameters are no good; always false.
    bool Refuse(const std::string& name, const std::string& reason);

    const Json::Value& GetErr() const { return err; }

  private:
    bool ReadField(const std::string& name, Node& node);

    const Json::Value& params;
    Json::Value err;
};

}  // namespace NodeRegistry

#endif
