// Reads and checks the parameters of a request. Every operation returns true, or false with the
// reason in GetErr(), so that a caller can chain them and check once:
//
//     Parameters parameters(request.getParams());
//     Node node;
//     if (!parameters.AreOnly({"name", "port"}) || !parameters.ReadFields({"name", "port"}, node))
//     {
//         return Response::Failure(ERR::BAD_PARAMETER, parameters.GetErr());
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
    // `object` must outlive this.
    explicit Parameters(const Json::Value& object) : params_(object) {}

    bool Has(const std::string& name) const;

    // Refuses any other parameter, because a misspelt "filter" would list every node.
    bool AreOnly(const std::vector<std::string>& names);

    // The node's "id" or, if there is none, its "name".
    bool ReadKey(NodeKey& ret_key);

    // Reads the named fields into `node`. All are required; on failure some may have been set.
    bool ReadFields(const std::vector<std::string>& names, Node& node);

    // The parameter "file".
    bool ReadFile(std::string& ret_path);

    // The condition of "filter"; empty, which means all nodes, if there is none.
    bool ReadFilter(std::string& ret_condition);

    // Records why the parameters are refused. Returns false.
    bool Refuse(const std::string& name, const std::string& reason);

    const Json::Value& GetErr() const { return err_; }

  private:
    bool ReadField(const std::string& name, Node& node);

    const Json::Value& params_;
    Json::Value err_;
};

}  // namespace NodeRegistry

#endif
