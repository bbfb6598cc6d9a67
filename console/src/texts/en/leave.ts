export const leave = {
  'leave.title': 'Leave {domain}?',
  'leave.what': 'What will happen',
  'leave.what.users': 'Users and groups of the domain can no longer use the appliance.',
  'leave.what.lists':
    'The lists of users and groups, the secret of the membership and its caches are deleted here.',
  'leave.what.workgroup':
    'The appliance goes back to the workgroup WORKGROUP. DNS servers and files stay as they are.',
  'leave.what.account': 'The computer account {account} stays in the domain, unless you have it deleted.',
  // In place of the account's name while that is not known.
  'leave.account.unnamed': 'of the appliance',
  'leave.delete': 'Delete the computer account {account} on the domain controller, too',
  'leave.delete.hint':
    'Needs an account of the domain that may delete it. If it is refused, nothing is changed.',
  'leave.confirm': 'Type {domain} to confirm',
  'leave.confirm.wrong': 'This is not the domain’s name.',
  'leave.submit': 'Leave domain',
  'leave.background': 'Close, the leave goes on',
  'leave.running': 'Leaving {domain}…',
  'leave.starting': 'The leave is starting…',
  'leave.stays': 'This can take a minute. It goes on in the appliance when you close this.',
  'leave.cutOff': 'The answer was cut off, but the leave goes on in the appliance. Its steps are watched.',
  'leave.done': 'The appliance left {domain}.',
  'leave.done.deleted': 'The computer account {account} was deleted on the domain controller.',
  'leave.done.gone': 'The domain did not know the computer account {account} any more.',
  'leave.done.stays':
    'The computer account {account} is still in the domain. Have it deleted on the domain controller when it is not needed any more.',
  'leave.failed': 'Leaving failed.',
  'leave.failedWithout': 'Leaving failed: {message}',
  'leave.unknownEnd': 'How the leave ended is not known.',
} as const;
