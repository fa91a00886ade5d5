// SPDX-License-Identifier: Apache-2.0
#include "tools/tracereader/CtfTrace.h"

#include <babeltrace2/babeltrace.h>
#include <cstring>
#include <filesystem>
#include <memory>
#include <optional>
#include <vector>

namespace tonewerk {
namespace {

constexpr char kBeginName[] = "tonewerk:signpost_begin";
constexpr char kEndName[] = "tonewerk:signpost_end";

template <auto release>
struct Release {
  template <typename T>
  void operator()(const T* object) const {
    release(object);
  }
};
using Plugin = std::unique_ptr<const bt_plugin, Release<bt_plugin_put_ref>>;
using Graph = std::unique_ptr<bt_graph, Release<bt_graph_put_ref>>;
using Iterator = std::unique_ptr<bt_message_iterator, Release<bt_message_iterator_put_ref>>;
using Parameters = std::unique_ptr<bt_value, Release<bt_value_put_ref>>;

// Finds the directories of the streams: those with a metadata file. The library does not search for them.
std::vector<std::string> streamDirectories(const std::string& root) {
  std::vector<std::string> found;
  std::error_code error;
  for (std::filesystem::recursive_directory_iterator at(root, error), end; !error && at != end;
       at.increment(error)) {
    if (at->path().filename() == "metadata") found.push_back(at->path().parent_path());
  }
  return found;
}

Plugin pluginNamed(const char* name) {
  const bt_plugin* plugin = nullptr;
  bt_plugin_find(name, BT_TRUE, BT_FALSE, BT_TRUE, BT_TRUE, BT_FALSE, &plugin);
  return Plugin(plugin);
}

std::optional<std::int64_t> integerOf(const bt_field* field) {
  if (field == nullptr) return std::nullopt;
  const bt_field_class_type type = bt_field_get_class_type(field);
  if (bt_field_class_type_is(type, BT_FIELD_CLASS_TYPE_SIGNED_INTEGER)) {
    return bt_field_integer_signed_get_value(field);
  }
  if (bt_field_class_type_is(type, BT_FIELD_CLASS_TYPE_UNSIGNED_INTEGER)) {
    return static_cast<std::int64_t>(bt_field_integer_unsigned_get_value(field));
  }
  return std::nullopt;
}

const bt_field* memberOf(const bt_field* structure, const char* name) {
  if (structure == nullptr || bt_field_get_class_type(structure) != BT_FIELD_CLASS_TYPE_STRUCTURE) {
    return nullptr;
  }
  return bt_field_structure_borrow_member_field_by_name_const(structure, name);
}

// Receives the messages at the end of the graph.
class Sink {
 public:
  explicit Sink(const std::function<bool(const SignpostEvent&)>& take) : take_(take) {}

  void setIterator(bt_message_iterator* iterator) { iterator_.reset(iterator); }
  void dropIterator() { iterator_.reset(); }
  const std::string& problem() const { return problem_; }

  bt_graph_simple_sink_component_consume_func_status consume() {
    bt_message_array_const messages = nullptr;
    std::uint64_t count = 0;
    switch (bt_message_iterator_next(iterator_.get(), &messages, &count)) {
      case BT_MESSAGE_ITERATOR_NEXT_STATUS_END:
        return BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_END;
      case BT_MESSAGE_ITERATOR_NEXT_STATUS_AGAIN:
        return BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_AGAIN;
      case BT_MESSAGE_ITERATOR_NEXT_STATUS_OK:
        break;
      default:
        return BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_ERROR;
    }
    for (std::uint64_t i = 0; i < count; ++i) {
      if (problem_.empty()) handle(messages[i]);
      bt_message_put_ref(messages[i]);
    }
    return problem_.empty() ? BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_OK
                            : BT_GRAPH_SIMPLE_SINK_COMPONENT_CONSUME_FUNC_STATUS_ERROR;
  }

 private:
  void handle(const bt_message* message) {
    switch (bt_message_get_type(message)) {
      case BT_MESSAGE_TYPE_EVENT:
        handleEvent(message);
        break;
      case BT_MESSAGE_TYPE_DISCARDED_EVENTS: {
        std::uint64_t count = 0;
        const bool isKnown =
            bt_message_discarded_events_get_count(message, &count) == BT_PROPERTY_AVAILABILITY_AVAILABLE;
        problem_ = "the trace has lost " + (isKnown ? std::to_string(count) + " " : "") + "events";
        break;
      }
      case BT_MESSAGE_TYPE_DISCARDED_PACKETS:
        problem_ = "the trace has lost packets of events";
        break;
      default:
        break;
    }
  }

  void handleEvent(const bt_message* message) {
    const bt_event* event = bt_message_event_borrow_event_const(message);
    const char* eventName = bt_event_class_get_name(bt_event_borrow_class_const(event));
    if (eventName == nullptr) return;
    const bool isBegin = std::strcmp(eventName, kBeginName) == 0;
    if (!isBegin && std::strcmp(eventName, kEndName) != 0) return;
    const bt_field* payload = bt_event_borrow_payload_field_const(event);
    const bt_field* name = memberOf(payload, "name");
    const auto identifier = integerOf(memberOf(payload, "identifier"));
    const bt_field* context = bt_event_borrow_common_context_field_const(event);
    const auto process = integerOf(memberOf(context, "vpid"));
    const auto thread = integerOf(memberOf(context, "vtid"));
    std::int64_t nanoseconds = 0;
    const bool isWhole =
        name != nullptr && bt_field_get_class_type(name) == BT_FIELD_CLASS_TYPE_STRING && identifier &&
        process && thread &&
        bt_clock_snapshot_get_ns_from_origin(bt_message_event_borrow_default_clock_snapshot_const(message),
                                             &nanoseconds) == BT_CLOCK_SNAPSHOT_GET_NS_FROM_ORIGIN_STATUS_OK;
    if (!isWhole) {
      problem_ = "a signpost event lacks a field";
      return;
    }
    const SignpostEvent found{.isBegin = isBegin,
                              .name = bt_field_string_get_value(name),
                              .identifier = static_cast<std::uint64_t>(*identifier),
                              .process = *process,
                              .thread = *thread,
                              .nanoseconds = nanoseconds};
    if (!take_(found)) problem_ = "too many intervals are open at once";
  }

  const std::function<bool(const SignpostEvent&)>& take_;
  Iterator iterator_;
  std::string problem_;
};

bt_graph_simple_sink_component_initialize_func_status initialize(bt_message_iterator* iterator, void* sink) {
  bt_message_iterator_get_ref(iterator);
  static_cast<Sink*>(sink)->setIterator(iterator);
  return BT_GRAPH_SIMPLE_SINK_COMPONENT_INITIALIZE_FUNC_STATUS_OK;
}
bt_graph_simple_sink_component_consume_func_status consume(bt_message_iterator*, void* sink) {
  return static_cast<Sink*>(sink)->consume();
}
void finalize(void* sink) { static_cast<Sink*>(sink)->dropIterator(); }

// Builds the graph: one source per directory -> a muxer -> the sink. A function returns false if it fails;
// the graph must not be used then.
class GraphBuilder {
 public:
  explicit GraphBuilder(bt_graph* graph) : graph_(graph) {}

  bool addMuxer(const bt_plugin* plugin) {
    const auto* type = bt_plugin_borrow_filter_component_class_by_name_const(plugin, "muxer");
    return type != nullptr &&
           bt_graph_add_filter_component(graph_, type, "muxer", nullptr, BT_LOGGING_LEVEL_NONE, &muxer_) ==
               BT_GRAPH_ADD_COMPONENT_STATUS_OK;
  }

  bool addSource(const bt_plugin* plugin, const std::string& directory) {
    const auto* type = bt_plugin_borrow_source_component_class_by_name_const(plugin, "fs");
    const Parameters parameters(bt_value_map_create());
    bt_value* inputs = nullptr;
    const bt_component_source* source = nullptr;
    const bool isAdded =
        type != nullptr && parameters != nullptr &&
        bt_value_map_insert_empty_array_entry(parameters.get(), "inputs", &inputs) ==
            BT_VALUE_MAP_INSERT_ENTRY_STATUS_OK &&
        bt_value_array_append_string_element(inputs, directory.c_str()) ==
            BT_VALUE_ARRAY_APPEND_ELEMENT_STATUS_OK &&
        bt_graph_add_source_component(graph_, type, directory.c_str(), parameters.get(),
                                      BT_LOGGING_LEVEL_NONE, &source) == BT_GRAPH_ADD_COMPONENT_STATUS_OK;
    if (!isAdded) return false;
    const std::uint64_t count = bt_component_source_get_output_port_count(source);
    for (std::uint64_t i = 0; i < count; ++i) {
      // The muxer adds an input port whenever one is connected.
      if (!connect(bt_component_source_borrow_output_port_by_index_const(source, i),
                   bt_component_filter_borrow_input_port_by_index_const(muxer_, inputs_++))) {
        return false;
      }
    }
    return true;
  }

  bool addSink(Sink& sink) {
    const bt_component_sink* added = nullptr;
    return bt_graph_add_simple_sink_component(graph_, "signposts", &initialize, &consume, &finalize, &sink,
                                              &added) == BT_GRAPH_ADD_COMPONENT_STATUS_OK &&
           connect(bt_component_filter_borrow_output_port_by_index_const(muxer_, 0),
                   bt_component_sink_borrow_input_port_by_index_const(added, 0));
  }

 private:
  bool connect(const bt_port_output* from, const bt_port_input* to) {
    return bt_graph_connect_ports(graph_, from, to, nullptr) == BT_GRAPH_CONNECT_PORTS_STATUS_OK;
  }

  bt_graph* const graph_;
  const bt_component_filter* muxer_ = nullptr;
  std::uint64_t inputs_ = 0;
};

bt_graph_run_status runToEnd(bt_graph* graph) {
  for (;;) {
    const bt_graph_run_status status = bt_graph_run(graph);
    if (status != BT_GRAPH_RUN_STATUS_AGAIN) return status;
  }
}

}  // namespace

std::string readCtfTrace(const std::string& directory,
                         const std::function<bool(const SignpostEvent&)>& take) {
  const std::vector<std::string> streams = streamDirectories(directory);
  if (streams.empty()) return "the trace holds no events";
  const Plugin ctf = pluginNamed("ctf");
  const Plugin utils = pluginNamed("utils");
  if (ctf == nullptr || utils == nullptr) return "the trace library's plug-ins are missing";
  Sink sink(take);  // outlives the graph
  const Graph graph(bt_graph_create(0));
  if (graph == nullptr) return "out of memory";
  GraphBuilder builder(graph.get());
  bool isBuilt = builder.addMuxer(utils.get());
  for (const std::string& stream : streams) isBuilt = isBuilt && builder.addSource(ctf.get(), stream);
  if (!isBuilt || !builder.addSink(sink)) return "the trace's description cannot be read";
  if (runToEnd(graph.get()) == BT_GRAPH_RUN_STATUS_OK) return sink.problem();
  return sink.problem().empty() ? "the trace is damaged" : sink.problem();
}

}  // namespace tonewerk
