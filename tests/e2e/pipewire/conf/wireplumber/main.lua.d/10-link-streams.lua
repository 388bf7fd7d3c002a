components = {}
function load_module(name, args)
  components[name] = { "libwireplumber-module-" .. name, type = "module", args = args }
end
function load_script(name, args)
  components[name] = { name, type = "script/lua", args = args }
end
load_module("metadata")
load_module("default-nodes", { ["use-persistent-storage"] = false })
load_module("si-node")
load_module("si-audio-adapter")
load_module("si-standard-link")
load_module("si-audio-endpoint")
load_module("default-nodes-api")
load_script("access/access-default.lua", { rules = {} })
load_script("static-endpoints.lua", {})
load_script("create-item.lua", { move = true, follow = true })
load_script("policy-node.lua", { move = true, follow = true })
