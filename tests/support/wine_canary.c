/* Proof that a Windows program really runs and that its exit code comes back: it must exit with 3. */
int main(void) {
  return 3;
}
