// Test support: runs an HLSL compute shader on a Vulkan device (a CPU implementation such as
// lavapipe is enough) and reads back the float4 values it writes to ksg_test_result, so that
// generated viewport code can be checked for its values, not only for compiling. Vulkan is
// loaded at run time; without it (or without its headers) evaluation reports itself unavailable.
#pragma once

#include "hlsl_compile_check.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string>
#include <vector>

#if __has_include(<vulkan/vulkan.h>)
#define TESSEL_TEST_HAVE_VULKAN 1
#include <dlfcn.h>
#include <vulkan/vulkan.h>
#endif

namespace viewport_test {

using Float4 = std::array<float, 4>;

struct Evaluation {
    bool available = false; // false: no Vulkan here, the check cannot run
    bool ok = false;
    // The device is a CPU implementation (lavapipe): IEEE float arithmetic, each operation
    // rounded as written unless the shader lets the compiler reassociate it.
    bool cpuDevice = false;
    std::string error;
    std::vector<Float4> values;
};

// The declaration the shader's results go to; the shader writes ksg_test_result[i].
inline const char* kEvaluationResultDeclaration =
    "[[vk::binding(0, 0)]] RWStructuredBuffer<float4> ksg_test_result;\n";

#ifdef TESSEL_TEST_HAVE_VULKAN

// A zeroed Vulkan structure of the given type.
template <class T>
T Info(VkStructureType type) {
    T info{};
    info.sType = type;
    return info;
}

// The Vulkan entry points a single compute dispatch needs, loaded from the system's loader.
class VulkanCompute {
public:
    static VulkanCompute& Instance() {
        static VulkanCompute compute;
        return compute;
    }
    bool Available() const { return m_device != VK_NULL_HANDLE; }
    bool CpuDevice() const { return m_cpuDevice; }

    // The buffer starts as `initial` (zeros past its end).
    bool Run(const std::vector<uint32_t>& spirv, size_t count, const std::vector<Float4>& initial,
             std::vector<Float4>& values, std::string& error) {
        const VkDeviceSize size = count * sizeof(Float4);
        auto bufferInfo = Info<VkBufferCreateInfo>(VK_STRUCTURE_TYPE_BUFFER_CREATE_INFO);
        bufferInfo.size = size;
        bufferInfo.usage = VK_BUFFER_USAGE_STORAGE_BUFFER_BIT;
        VkBuffer buffer = VK_NULL_HANDLE;
        if (f.CreateBuffer(m_device, &bufferInfo, nullptr, &buffer) != VK_SUCCESS)
            return Fail(error, "vkCreateBuffer");
        VkMemoryRequirements requirements;
        f.GetBufferMemoryRequirements(m_device, buffer, &requirements);
        auto allocation = Info<VkMemoryAllocateInfo>(VK_STRUCTURE_TYPE_MEMORY_ALLOCATE_INFO);
        allocation.allocationSize = requirements.size;
        allocation.memoryTypeIndex = m_hostMemoryType;
        VkDeviceMemory memory = VK_NULL_HANDLE;
        if (f.AllocateMemory(m_device, &allocation, nullptr, &memory) != VK_SUCCESS)
            return Fail(error, "vkAllocateMemory");
        f.BindBufferMemory(m_device, buffer, memory, 0);
        void* mapped = nullptr;
        f.MapMemory(m_device, memory, 0, size, 0, &mapped);
        std::memset(mapped, 0, size);
        std::memcpy(mapped, initial.data(), std::min(initial.size(), count) * sizeof(Float4));

        auto moduleInfo =
            Info<VkShaderModuleCreateInfo>(VK_STRUCTURE_TYPE_SHADER_MODULE_CREATE_INFO);
        moduleInfo.codeSize = spirv.size() * sizeof(uint32_t);
        moduleInfo.pCode = spirv.data();
        VkShaderModule module = VK_NULL_HANDLE;
        f.CreateShaderModule(m_device, &moduleInfo, nullptr, &module);
        VkDescriptorSetLayoutBinding binding{0, VK_DESCRIPTOR_TYPE_STORAGE_BUFFER, 1,
                                             VK_SHADER_STAGE_COMPUTE_BIT, nullptr};
        auto layoutInfo = Info<VkDescriptorSetLayoutCreateInfo>(
            VK_STRUCTURE_TYPE_DESCRIPTOR_SET_LAYOUT_CREATE_INFO);
        layoutInfo.bindingCount = 1;
        layoutInfo.pBindings = &binding;
        VkDescriptorSetLayout setLayout = VK_NULL_HANDLE;
        f.CreateDescriptorSetLayout(m_device, &layoutInfo, nullptr, &setLayout);
        auto pipelineLayoutInfo =
            Info<VkPipelineLayoutCreateInfo>(VK_STRUCTURE_TYPE_PIPELINE_LAYOUT_CREATE_INFO);
        pipelineLayoutInfo.setLayoutCount = 1;
        pipelineLayoutInfo.pSetLayouts = &setLayout;
        VkPipelineLayout pipelineLayout = VK_NULL_HANDLE;
        f.CreatePipelineLayout(m_device, &pipelineLayoutInfo, nullptr, &pipelineLayout);
        auto pipelineInfo =
            Info<VkComputePipelineCreateInfo>(VK_STRUCTURE_TYPE_COMPUTE_PIPELINE_CREATE_INFO);
        pipelineInfo.stage.sType = VK_STRUCTURE_TYPE_PIPELINE_SHADER_STAGE_CREATE_INFO;
        pipelineInfo.stage.stage = VK_SHADER_STAGE_COMPUTE_BIT;
        pipelineInfo.stage.module = module;
        pipelineInfo.stage.pName = "main";
        pipelineInfo.layout = pipelineLayout;
        VkPipeline pipeline = VK_NULL_HANDLE;
        const VkResult created = f.CreateComputePipelines(m_device, VK_NULL_HANDLE, 1,
                                                          &pipelineInfo, nullptr, &pipeline);

        VkDescriptorPoolSize poolSize{VK_DESCRIPTOR_TYPE_STORAGE_BUFFER, 1};
        auto poolInfo =
            Info<VkDescriptorPoolCreateInfo>(VK_STRUCTURE_TYPE_DESCRIPTOR_POOL_CREATE_INFO);
        poolInfo.maxSets = 1;
        poolInfo.poolSizeCount = 1;
        poolInfo.pPoolSizes = &poolSize;
        VkDescriptorPool pool = VK_NULL_HANDLE;
        f.CreateDescriptorPool(m_device, &poolInfo, nullptr, &pool);
        auto setInfo =
            Info<VkDescriptorSetAllocateInfo>(VK_STRUCTURE_TYPE_DESCRIPTOR_SET_ALLOCATE_INFO);
        setInfo.descriptorPool = pool;
        setInfo.descriptorSetCount = 1;
        setInfo.pSetLayouts = &setLayout;
        VkDescriptorSet set = VK_NULL_HANDLE;
        f.AllocateDescriptorSets(m_device, &setInfo, &set);
        VkDescriptorBufferInfo bufferDescriptor{buffer, 0, size};
        auto write = Info<VkWriteDescriptorSet>(VK_STRUCTURE_TYPE_WRITE_DESCRIPTOR_SET);
        write.dstSet = set;
        write.descriptorCount = 1;
        write.descriptorType = VK_DESCRIPTOR_TYPE_STORAGE_BUFFER;
        write.pBufferInfo = &bufferDescriptor;
        f.UpdateDescriptorSets(m_device, 1, &write, 0, nullptr);

        bool ran = false;
        if (created == VK_SUCCESS) {
            auto commandInfo =
                Info<VkCommandBufferAllocateInfo>(VK_STRUCTURE_TYPE_COMMAND_BUFFER_ALLOCATE_INFO);
            commandInfo.commandPool = m_commandPool;
            commandInfo.level = VK_COMMAND_BUFFER_LEVEL_PRIMARY;
            commandInfo.commandBufferCount = 1;
            VkCommandBuffer commands = VK_NULL_HANDLE;
            f.AllocateCommandBuffers(m_device, &commandInfo, &commands);
            auto begin =
                Info<VkCommandBufferBeginInfo>(VK_STRUCTURE_TYPE_COMMAND_BUFFER_BEGIN_INFO);
            f.BeginCommandBuffer(commands, &begin);
            f.CmdBindPipeline(commands, VK_PIPELINE_BIND_POINT_COMPUTE, pipeline);
            f.CmdBindDescriptorSets(commands, VK_PIPELINE_BIND_POINT_COMPUTE, pipelineLayout, 0, 1,
                                    &set, 0, nullptr);
            f.CmdDispatch(commands, 1, 1, 1);
            f.EndCommandBuffer(commands);
            auto submit = Info<VkSubmitInfo>(VK_STRUCTURE_TYPE_SUBMIT_INFO);
            submit.commandBufferCount = 1;
            submit.pCommandBuffers = &commands;
            ran = f.QueueSubmit(m_queue, 1, &submit, VK_NULL_HANDLE) == VK_SUCCESS &&
                  f.QueueWaitIdle(m_queue) == VK_SUCCESS;
            f.FreeCommandBuffers(m_device, m_commandPool, 1, &commands);
        }
        values.resize(count);
        std::memcpy(values.data(), mapped, size);
        f.UnmapMemory(m_device, memory);
        f.DestroyDescriptorPool(m_device, pool, nullptr);
        if (pipeline != VK_NULL_HANDLE) f.DestroyPipeline(m_device, pipeline, nullptr);
        f.DestroyPipelineLayout(m_device, pipelineLayout, nullptr);
        f.DestroyDescriptorSetLayout(m_device, setLayout, nullptr);
        f.DestroyShaderModule(m_device, module, nullptr);
        f.DestroyBuffer(m_device, buffer, nullptr);
        f.FreeMemory(m_device, memory, nullptr);
        if (created != VK_SUCCESS) return Fail(error, "vkCreateComputePipelines");
        if (!ran) return Fail(error, "vkQueueSubmit");
        return true;
    }

private:
    struct Functions {
#define TESSEL_VK_FUNCTION(name) PFN_vk##name name = nullptr;
#define TESSEL_VK_FUNCTIONS                                                                        \
    TESSEL_VK_FUNCTION(CreateInstance)                                                             \
    TESSEL_VK_FUNCTION(EnumeratePhysicalDevices)                                                   \
    TESSEL_VK_FUNCTION(GetPhysicalDeviceQueueFamilyProperties)                                     \
    TESSEL_VK_FUNCTION(GetPhysicalDeviceMemoryProperties)                                          \
    TESSEL_VK_FUNCTION(GetPhysicalDeviceProperties)                                                \
    TESSEL_VK_FUNCTION(CreateDevice)                                                               \
    TESSEL_VK_FUNCTION(GetDeviceQueue)                                                             \
    TESSEL_VK_FUNCTION(CreateCommandPool)                                                          \
    TESSEL_VK_FUNCTION(CreateBuffer)                                                               \
    TESSEL_VK_FUNCTION(GetBufferMemoryRequirements)                                                \
    TESSEL_VK_FUNCTION(AllocateMemory)                                                             \
    TESSEL_VK_FUNCTION(BindBufferMemory)                                                           \
    TESSEL_VK_FUNCTION(MapMemory)                                                                  \
    TESSEL_VK_FUNCTION(UnmapMemory)                                                                \
    TESSEL_VK_FUNCTION(CreateShaderModule)                                                         \
    TESSEL_VK_FUNCTION(CreateDescriptorSetLayout)                                                  \
    TESSEL_VK_FUNCTION(CreatePipelineLayout)                                                       \
    TESSEL_VK_FUNCTION(CreateComputePipelines)                                                     \
    TESSEL_VK_FUNCTION(CreateDescriptorPool)                                                       \
    TESSEL_VK_FUNCTION(AllocateDescriptorSets)                                                     \
    TESSEL_VK_FUNCTION(UpdateDescriptorSets)                                                       \
    TESSEL_VK_FUNCTION(AllocateCommandBuffers)                                                     \
    TESSEL_VK_FUNCTION(BeginCommandBuffer)                                                         \
    TESSEL_VK_FUNCTION(CmdBindPipeline)                                                            \
    TESSEL_VK_FUNCTION(CmdBindDescriptorSets)                                                      \
    TESSEL_VK_FUNCTION(CmdDispatch)                                                                \
    TESSEL_VK_FUNCTION(EndCommandBuffer)                                                           \
    TESSEL_VK_FUNCTION(QueueSubmit)                                                                \
    TESSEL_VK_FUNCTION(QueueWaitIdle)                                                              \
    TESSEL_VK_FUNCTION(FreeCommandBuffers)                                                         \
    TESSEL_VK_FUNCTION(DestroyDescriptorPool)                                                      \
    TESSEL_VK_FUNCTION(DestroyPipeline)                                                            \
    TESSEL_VK_FUNCTION(DestroyPipelineLayout)                                                      \
    TESSEL_VK_FUNCTION(DestroyDescriptorSetLayout)                                                 \
    TESSEL_VK_FUNCTION(DestroyShaderModule)                                                        \
    TESSEL_VK_FUNCTION(DestroyBuffer)                                                              \
    TESSEL_VK_FUNCTION(FreeMemory)
        TESSEL_VK_FUNCTIONS
#undef TESSEL_VK_FUNCTION
    };

    static bool Fail(std::string& error, const char* what) {
        error = std::string(what) + " failed";
        return false;
    }

    // The device is kept for the whole test run; the process exit releases it.
    VulkanCompute() {
        void* library = dlopen("libvulkan.so.1", RTLD_NOW | RTLD_LOCAL);
        if (!library) return;
        const auto getInstanceProc =
            reinterpret_cast<PFN_vkGetInstanceProcAddr>(dlsym(library, "vkGetInstanceProcAddr"));
        if (!getInstanceProc) return;
        f.CreateInstance = reinterpret_cast<PFN_vkCreateInstance>(
            getInstanceProc(VK_NULL_HANDLE, "vkCreateInstance"));
        if (!f.CreateInstance) return;
        auto application = Info<VkApplicationInfo>(VK_STRUCTURE_TYPE_APPLICATION_INFO);
        application.apiVersion = VK_API_VERSION_1_1;
        auto instanceInfo = Info<VkInstanceCreateInfo>(VK_STRUCTURE_TYPE_INSTANCE_CREATE_INFO);
        instanceInfo.pApplicationInfo = &application;
        if (f.CreateInstance(&instanceInfo, nullptr, &m_instance) != VK_SUCCESS) return;
#define TESSEL_VK_FUNCTION(name)                                                                   \
    if (!f.name) f.name = reinterpret_cast<PFN_vk##name>(getInstanceProc(m_instance, "vk" #name)); \
    if (!f.name) return;
        TESSEL_VK_FUNCTIONS
#undef TESSEL_VK_FUNCTION
        uint32_t deviceCount = 0;
        f.EnumeratePhysicalDevices(m_instance, &deviceCount, nullptr);
        std::vector<VkPhysicalDevice> devices(deviceCount);
        f.EnumeratePhysicalDevices(m_instance, &deviceCount, devices.data());
        for (VkPhysicalDevice physical : devices) {
            uint32_t familyCount = 0;
            f.GetPhysicalDeviceQueueFamilyProperties(physical, &familyCount, nullptr);
            std::vector<VkQueueFamilyProperties> families(familyCount);
            f.GetPhysicalDeviceQueueFamilyProperties(physical, &familyCount, families.data());
            for (uint32_t family = 0; family < familyCount; ++family) {
                if (!(families[family].queueFlags & VK_QUEUE_COMPUTE_BIT)) continue;
                if (OpenDevice(physical, family)) return;
            }
        }
    }

    bool OpenDevice(VkPhysicalDevice physical, uint32_t family) {
        VkPhysicalDeviceMemoryProperties memory;
        f.GetPhysicalDeviceMemoryProperties(physical, &memory);
        const VkMemoryPropertyFlags wanted =
            VK_MEMORY_PROPERTY_HOST_VISIBLE_BIT | VK_MEMORY_PROPERTY_HOST_COHERENT_BIT;
        uint32_t type = memory.memoryTypeCount;
        for (uint32_t i = 0; i < memory.memoryTypeCount; ++i)
            if ((memory.memoryTypes[i].propertyFlags & wanted) == wanted) {
                type = i;
                break;
            }
        if (type == memory.memoryTypeCount) return false;
        const float priority = 1.0f;
        auto queueInfo = Info<VkDeviceQueueCreateInfo>(VK_STRUCTURE_TYPE_DEVICE_QUEUE_CREATE_INFO);
        queueInfo.queueFamilyIndex = family;
        queueInfo.queueCount = 1;
        queueInfo.pQueuePriorities = &priority;
        auto deviceInfo = Info<VkDeviceCreateInfo>(VK_STRUCTURE_TYPE_DEVICE_CREATE_INFO);
        deviceInfo.queueCreateInfoCount = 1;
        deviceInfo.pQueueCreateInfos = &queueInfo;
        VkDevice device = VK_NULL_HANDLE;
        if (f.CreateDevice(physical, &deviceInfo, nullptr, &device) != VK_SUCCESS) return false;
        f.GetDeviceQueue(device, family, 0, &m_queue);
        auto poolInfo = Info<VkCommandPoolCreateInfo>(VK_STRUCTURE_TYPE_COMMAND_POOL_CREATE_INFO);
        poolInfo.queueFamilyIndex = family;
        if (f.CreateCommandPool(device, &poolInfo, nullptr, &m_commandPool) != VK_SUCCESS)
            return false;
        VkPhysicalDeviceProperties properties;
        f.GetPhysicalDeviceProperties(physical, &properties);
        m_cpuDevice = properties.deviceType == VK_PHYSICAL_DEVICE_TYPE_CPU;
        m_hostMemoryType = type;
        m_device = device;
        return true;
    }

    Functions f;
    VkInstance m_instance = VK_NULL_HANDLE;
    VkDevice m_device = VK_NULL_HANDLE;
    VkQueue m_queue = VK_NULL_HANDLE;
    VkCommandPool m_commandPool = VK_NULL_HANDLE;
    uint32_t m_hostMemoryType = 0;
    bool m_cpuDevice = false;
};

#endif

// Compiles `shader` (which declares ksg_test_result as kEvaluationResultDeclaration and has a
// [numthreads(1, 1, 1)] entry point "main") and runs it once; `count` float4 values come back.
// The buffer holds `initial` when the shader starts, so inputs can travel in it: the device
// compiles large constant arrays in a shader far more slowly.
inline Evaluation EvaluateHLSL(const std::string& shader, size_t count,
                               const std::vector<Float4>& initial = {}) {
    Evaluation evaluation;
#ifdef TESSEL_TEST_HAVE_VULKAN
    if (!GlslangAvailable() || !VulkanCompute::Instance().Available()) return evaluation;
    evaluation.available = true;
    evaluation.cpuDevice = VulkanCompute::Instance().CpuDevice();
    std::vector<uint32_t> spirv;
    const CompileResult compiled = CompileHLSLToSPIRV(shader, spirv);
    if (!compiled.ok) {
        evaluation.error = compiled.log + "\n---- shader ----\n" + shader;
        return evaluation;
    }
    evaluation.ok =
        VulkanCompute::Instance().Run(spirv, count, initial, evaluation.values, evaluation.error);
#else
    (void)shader;
    (void)count;
    (void)initial;
#endif
    return evaluation;
}

} // namespace viewport_test
