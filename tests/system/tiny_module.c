/* Nothing but an export: the module-name test loads a copy of it from a path beyond 260 characters. */
__declspec(dllexport) int ostrand_tiny_module_answer(void)
{
    return 42;
}
