// What every static program costs, from its start to its end.

int main() {}
