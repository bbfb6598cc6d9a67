import { Divider } from '@patternfly/react-core/dist/esm/components/Divider';
import {
  Dropdown,
  DropdownGroup,
  DropdownItem,
  DropdownList,
} from '@patternfly/react-core/dist/esm/components/Dropdown';
import { MenuToggle } from '@patternfly/react-core/dist/esm/components/MenuToggle';
import UserIcon from '@patternfly/react-icons/dist/esm/icons/user-icon';
import { useState } from 'react';
import { logOut } from '../api/client';
import { session } from '../api/session';
import { useStore } from '../api/store';
import { t } from '../texts';
import { kHome, navigate } from './router';
import { chooseTheme, theme, type Choice } from '../theme/theme';
import { useCall } from '../ui';

const kChoices: Choice[] = ['system', 'light', 'dark'];

// Who is logged in, the page's colours, and log-out.
export function UserMenu() {
  const [open, setOpen] = useState(false);
  const chosen = useStore(theme);
  const now = useStore(session);
  const leave = useCall(logOut);
  const user = now.state === 'active' ? now.info.user : '';

  return (
    <Dropdown
      isOpen={open}
      onOpenChange={setOpen}
      onSelect={() => setOpen(false)}
      popperProps={{ position: 'right', appendTo: 'inline', minWidth: '12rem' }}
      toggle={(ref) => (
        <MenuToggle
          ref={ref}
          icon={<UserIcon />}
          isExpanded={open}
          onClick={() => setOpen(!open)}
          aria-label={t('user.menu', { user })}
        >
          {user}
        </MenuToggle>
      )}
    >
      <DropdownGroup label={t('theme.label')} labelHeadingLevel="h2">
        <DropdownList>
          {kChoices.map((choice) => (
            <DropdownItem key={choice} isSelected={choice === chosen} onClick={() => chooseTheme(choice)}>
              {t(`theme.${choice}`)}
            </DropdownItem>
          ))}
        </DropdownList>
      </DropdownGroup>
      <Divider />
      <DropdownList>
        <DropdownItem
          isDisabled={leave.busy}
          onClick={() => void leave.run().then(() => navigate(kHome, { replace: true }))}
        >
          {t('user.logOut')}
        </DropdownItem>
      </DropdownList>
    </Dropdown>
  );
}
