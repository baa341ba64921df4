/* A module with nothing in it, loaded from a long path by the module-name tests. */
__declspec(dllexport) int ostrand_tiny_module_answer(void)
{
    return 42;
}
