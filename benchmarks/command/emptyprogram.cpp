// What a process takes that loads the libraries for XML and reference systems, and does nothing.
int main()
{
    return 0;
}
